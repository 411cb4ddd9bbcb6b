#pragma once
// A Secret Service (org.freedesktop.secrets) of the least kind on a private session bus, for testing the
// real keychain client (QtKeychain over libsecret) against keyrings that misbehave: one that never
// answers, one that refuses, and one whose default keyring does not exist yet and prompts for it, the
// prompt being dismissed, never answered or answered late. Secrets travel in the "plain" session.
// QtDBus hands the calls over on a thread of its own, and the service answers prompts from another, so a
// client may wait for it on the main thread.
#include "PrivateBus.h"

#include <QDBusArgument>
#include <QDBusConnection>
#include <QDBusMessage>
#include <QDBusMetaType>
#include <QDBusObjectPath>
#include <QDBusVariant>
#include <QDBusVirtualObject>
#include <QMap>
#include <QMutex>
#include <QThread>
#include <QTimer>
#include <QUuid>

#include <atomic>

namespace fakesecrets {

struct Secret {
  QDBusObjectPath session;
  QByteArray parameters;
  QByteArray value;
  QString contentType;
};

inline QDBusArgument& operator<<(QDBusArgument& argument, const Secret& secret) {
  argument.beginStructure();
  argument << secret.session << secret.parameters << secret.value << secret.contentType;
  argument.endStructure();
  return argument;
}

inline const QDBusArgument& operator>>(const QDBusArgument& argument, Secret& secret) {
  argument.beginStructure();
  argument >> secret.session >> secret.parameters >> secret.value >> secret.contentType;
  argument.endStructure();
  return argument;
}

}  // namespace fakesecrets

Q_DECLARE_METATYPE(fakesecrets::Secret)

namespace fakesecrets {

using Secrets = QMap<QDBusObjectPath, Secret>;

class FakeSecretService final : public QDBusVirtualObject {
 public:
  enum class Answer {
    Never,   // takes every call and answers none
    Refuse,  // answers every call with AccessDenied
    Keyring  // works as a keyring does
  };
  enum class Prompt {
    None,       // the default keyring exists: no prompt
    Never,      // the prompt for a new default keyring is never answered
    Dismissed,  // the user cancels it
    Accepted    // the user chooses a password, after `promptDelayMs`
  };
  struct Behaviour {
    Answer answer = Answer::Keyring;
    Prompt prompt = Prompt::None;
    int promptDelayMs = 0;
  };

  static constexpr const char* kRoot = "/org/freedesktop/secrets";

  FakeSecretService() {
    qDBusRegisterMetaType<Secret>();
    qDBusRegisterMetaType<Secrets>();
    thread_.start();
  }
  ~FakeSecretService() override {
    thread_.quit();
    thread_.wait();
    if (registered_) {
      QDBusConnection connection = QDBusConnection(name_);
      connection.unregisterObject(QString::fromLatin1(kRoot), QDBusConnection::UnregisterTree);
      connection.unregisterService(QStringLiteral("org.freedesktop.secrets"));
      QDBusConnection::disconnectFromBus(name_);
    }
  }

  // Connects to `address` and takes the service's name; false when that fails.
  bool start(const QString& address) {
    name_ = QStringLiteral("fake-secrets-%1").arg(QUuid::createUuid().toString(QUuid::Id128));
    QDBusConnection connection = QDBusConnection::connectToBus(address, name_);
    registered_ =
        connection.isConnected() &&
        connection.registerVirtualObject(QString::fromLatin1(kRoot), this, QDBusConnection::SubPath) &&
        connection.registerService(QStringLiteral("org.freedesktop.secrets"));
    moveToThread(&thread_);
    return registered_;
  }

  void setBehaviour(const Behaviour& behaviour) {
    QMutexLocker lock(&mutex_);
    behaviour_ = behaviour;
    keyringExists_ = behaviour.prompt == Prompt::None;
  }
  // Calls received since the start, of any kind (touching the service counts).
  int calls() const { return calls_; }
  // The secret stored under the keychain entry `key`, if any.
  QByteArray secret(const QString& key) const {
    QMutexLocker lock(&mutex_);
    return secrets_.value(safe(key));
  }

  QString introspect(const QString&) const override { return {}; }

  bool handleMessage(const QDBusMessage& message, const QDBusConnection& connection) override {
    ++calls_;
    QMutexLocker lock(&mutex_);
    const QString member = message.member();
    auto reply = [&](const QList<QVariant>& arguments) {
      connection.send(message.createReply(arguments));
      return true;
    };
    auto fail = [&](const QString& name, const QString& text) {
      connection.send(message.createErrorReply(name, text));
      return true;
    };
    if (behaviour_.answer == Answer::Never) return true;
    if (behaviour_.answer == Answer::Refuse)
      return fail(QStringLiteral("org.freedesktop.DBus.Error.AccessDenied"), QStringLiteral("Refused"));

    const QString path = message.path();
    if (member == QLatin1String("GetAll")) {
      const QList<QDBusObjectPath> collections;
      return reply({QVariantMap{{QStringLiteral("Collections"), QVariant::fromValue(collections)}}});
    }
    if (member == QLatin1String("OpenSession")) {
      if (message.arguments().value(0).toString() != QLatin1String("plain"))
        return fail(QStringLiteral("org.freedesktop.DBus.Error.NotSupported"), QStringLiteral("plain only"));
      return reply({QVariant::fromValue(QDBusVariant(QString())),
                    QVariant::fromValue(QDBusObjectPath(QString::fromLatin1(kRoot) + "/session/1"))});
    }
    if (member == QLatin1String("CreateItem")) {
      if (!keyringExists_)
        return fail(QStringLiteral("org.freedesktop.DBus.Error.UnknownMethod"),
                    QStringLiteral("Object does not exist at path %1").arg(path));
      const QVariantMap properties = qdbus_cast<QVariantMap>(message.arguments().value(0));
      const auto attributes = qdbus_cast<QMap<QString, QString>>(
          properties.value(QStringLiteral("org.freedesktop.Secret.Item.Attributes")));
      const Secret secret = qdbus_cast<Secret>(message.arguments().value(1));
      const QString key = safe(attributes.value(QStringLiteral("user")));
      secrets_.insert(key, secret.value);
      return reply({QVariant::fromValue(itemPath(key)), QVariant::fromValue(QDBusObjectPath("/"))});
    }
    if (member == QLatin1String("CreateCollection")) {
      return reply({QVariant::fromValue(QDBusObjectPath("/")),
                    QVariant::fromValue(QDBusObjectPath(QString::fromLatin1(kRoot) + "/prompt/p1"))});
    }
    if (member == QLatin1String("Prompt")) {
      reply({});
      const Prompt prompt = behaviour_.prompt;
      QDBusConnection bus = connection;
      auto complete = [this, bus, path, prompt]() mutable {
        const bool accepted = prompt == Prompt::Accepted;
        if (accepted) {
          QMutexLocker lock(&mutex_);
          keyringExists_ = true;
        }
        QDBusMessage signal = QDBusMessage::createSignal(
            path, QStringLiteral("org.freedesktop.Secret.Prompt"), QStringLiteral("Completed"));
        const QString collection =
            accepted ? QString::fromLatin1(kRoot) + "/collection/login" : QStringLiteral("/");
        signal << !accepted
               << QVariant::fromValue(QDBusVariant(QVariant::fromValue(QDBusObjectPath(collection))));
        bus.send(signal);
      };
      // Calls come on QtDBus's own thread; the prompt is answered from the service's.
      const int delay = prompt == Prompt::Accepted ? behaviour_.promptDelayMs : 0;
      if (prompt == Prompt::Dismissed || prompt == Prompt::Accepted)
        QMetaObject::invokeMethod(this,
                                  [this, delay, complete] { QTimer::singleShot(delay, this, complete); });
      return true;
    }
    if (member == QLatin1String("SearchItems")) {
      const auto attributes = qdbus_cast<QMap<QString, QString>>(message.arguments().value(0));
      const QString key = safe(attributes.value(QStringLiteral("user")));
      QList<QDBusObjectPath> found;
      if (keyringExists_ && secrets_.contains(key)) found.append(itemPath(key));
      return reply({QVariant::fromValue(found), QVariant::fromValue(QList<QDBusObjectPath>())});
    }
    if (member == QLatin1String("GetSecrets")) {
      Secrets found;
      for (const QDBusObjectPath& item : qdbus_cast<QList<QDBusObjectPath>>(message.arguments().value(0))) {
        const QString key = item.path().section(u'/', -1);
        if (secrets_.contains(key))
          found.insert(item, {QDBusObjectPath(QString::fromLatin1(kRoot) + "/session/1"),
                              {},
                              secrets_.value(key),
                              QStringLiteral("text/plain")});
      }
      return reply({QVariant::fromValue(found)});
    }
    if (member == QLatin1String("Delete")) {
      secrets_.remove(path.section(u'/', -1));
      return reply({QVariant::fromValue(QDBusObjectPath("/"))});
    }
    return fail(QStringLiteral("org.freedesktop.DBus.Error.UnknownMethod"), member);
  }

 private:
  // Keys in these tests are made of letters and dashes; a D-Bus path takes no dashes.
  static QString safe(QString key) { return key.replace(u'-', u'_'); }
  static QDBusObjectPath itemPath(const QString& safeKey) {
    return QDBusObjectPath(QString::fromLatin1(kRoot) + "/collection/login/" + safeKey);
  }

  QThread thread_;
  QString name_;
  bool registered_ = false;
  mutable QMutex mutex_;
  Behaviour behaviour_;
  bool keyringExists_ = true;
  QMap<QString, QByteArray> secrets_;
  std::atomic<int> calls_{0};
};

}  // namespace fakesecrets
