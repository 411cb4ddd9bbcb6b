#pragma once
// A least Secret Service on a private bus, answering from its own thread, misbehaving on request.
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

namespace fakesecrets {

struct Secret {
  QDBusObjectPath session;
  QByteArray parameters;
  QByteArray value;
  QString contentType;
};

inline QDBusArgument& operator<<(QDBusArgument& a, const Secret& s) {
  a.beginStructure();
  a << s.session << s.parameters << s.value << s.contentType;
  return a.endStructure(), a;
}
inline const QDBusArgument& operator>>(const QDBusArgument& a, Secret& s) {
  a.beginStructure();
  a >> s.session >> s.parameters >> s.value >> s.contentType;
  return a.endStructure(), a;
}

}  // namespace fakesecrets

Q_DECLARE_METATYPE(fakesecrets::Secret)

namespace fakesecrets {

using Secrets = QMap<QDBusObjectPath, Secret>;

class FakeSecretService final : public QDBusVirtualObject {
 public:
  // Never takes calls and answers none; Refuse answers AccessDenied; Keyring works as a keyring does.
  enum class Answer { Never, Refuse, Keyring };
  // None: the default keyring exists; else the prompt to make it is dismissed or accepted (after
  // `promptDelayMs`).
  enum class Prompt { None, Dismissed, Accepted };
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
    if (!registered_) return;
    QDBusConnection(name_).unregisterObject(QString::fromLatin1(kRoot), QDBusConnection::UnregisterTree);
    QDBusConnection(name_).unregisterService("org.freedesktop.secrets");
    QDBusConnection::disconnectFromBus(name_);
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
  // The secret stored under the keychain entry `key`, if any.
  QByteArray secret(const QString& key) const {
    QMutexLocker lock(&mutex_);
    return secrets_.value(safe(key));
  }

  QString introspect(const QString&) const override { return {}; }

  bool handleMessage(const QDBusMessage& message, const QDBusConnection& connection) override {
    QMutexLocker lock(&mutex_);
    const QString member = message.member();
    auto reply = [&](const QList<QVariant>& arguments) {
      return connection.send(message.createReply(arguments)), true;
    };
    auto fail = [&](const QString& name, const QString& text) {
      return connection.send(message.createErrorReply("org.freedesktop.DBus.Error." + name, text)), true;
    };
    auto path = [](const QString& sub) {
      return QVariant::fromValue(QDBusObjectPath(QString::fromLatin1(kRoot) + sub));
    };
    const QVariant noPath = QVariant::fromValue(QDBusObjectPath("/"));
    if (behaviour_.answer == Answer::Never) return true;
    if (behaviour_.answer == Answer::Refuse) return fail("AccessDenied", "Refused");

    const QVariant first = message.arguments().value(0);
    if (member == "GetAll")
      return reply({QVariantMap{{"Collections", QVariant::fromValue(QList<QDBusObjectPath>())}}});
    if (member == "OpenSession") {
      if (first.toString() != "plain") return fail("NotSupported", "plain only");
      return reply({QVariant::fromValue(QDBusVariant(QString())), path("/session/1")});
    }
    if (member == "CreateItem") {
      if (!keyringExists_) return fail("UnknownMethod", "Object does not exist at path " + message.path());
      const auto attributes = qdbus_cast<QMap<QString, QString>>(
          qdbus_cast<QVariantMap>(first).value("org.freedesktop.Secret.Item.Attributes"));
      const QString key = safe(attributes.value("user"));
      secrets_.insert(key, qdbus_cast<Secret>(message.arguments().value(1)).value);
      return reply({QVariant::fromValue(itemPath(key)), noPath});
    }
    if (member == "CreateCollection") return reply({noPath, path("/prompt/p1")});
    if (member == "Prompt") {
      reply({});
      const Prompt prompt = behaviour_.prompt;
      QDBusConnection bus = connection;
      auto complete = [this, bus, path = message.path(), prompt]() mutable {
        const bool accepted = prompt == Prompt::Accepted;
        if (accepted) {
          QMutexLocker lock(&mutex_);
          keyringExists_ = true;
        }
        QDBusMessage signal = QDBusMessage::createSignal(path, "org.freedesktop.Secret.Prompt", "Completed");
        const QString collection = accepted ? QString::fromLatin1(kRoot) + "/collection/login" : "/";
        signal << !accepted
               << QVariant::fromValue(QDBusVariant(QVariant::fromValue(QDBusObjectPath(collection))));
        bus.send(signal);
      };
      // Calls come on QtDBus's own thread; the prompt is answered from the service's.
      const int delay = prompt == Prompt::Accepted ? behaviour_.promptDelayMs : 0;
      QMetaObject::invokeMethod(this, [this, delay, complete] { QTimer::singleShot(delay, this, complete); });
      return true;
    }
    if (member == "SearchItems") {
      const QString key = safe(qdbus_cast<QMap<QString, QString>>(first).value("user"));
      QList<QDBusObjectPath> found;
      if (keyringExists_ && secrets_.contains(key)) found.append(itemPath(key));
      return reply({QVariant::fromValue(found), QVariant::fromValue(QList<QDBusObjectPath>())});
    }
    if (member == "GetSecrets") {
      Secrets found;
      for (const QDBusObjectPath& item : qdbus_cast<QList<QDBusObjectPath>>(first)) {
        const QString key = item.path().section(u'/', -1);
        if (secrets_.contains(key))
          found.insert(item,
                       {path("/session/1").value<QDBusObjectPath>(), {}, secrets_.value(key), "text/plain"});
      }
      return reply({QVariant::fromValue(found)});
    }
    if (member == "Delete") return secrets_.remove(message.path().section(u'/', -1)), reply({noPath});
    return fail("UnknownMethod", member);
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
};

}  // namespace fakesecrets
