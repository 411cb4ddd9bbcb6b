#pragma once
// One installation of Tessal whose real `tessal` runs as a separate process: own folders, no display.
#include "TestFiles.h"
#include "WTClient.h"
#include "WTObjectContext.h"
#include "WTProject.h"
#include "WTStore.h"
#include "WTTask.h"
#include "WTTime.h"

#include <gtest/gtest.h>

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QMap>
#include <QProcess>
#include <QSettings>
#include <QTemporaryDir>

#include <memory>

namespace commandtest {

struct Outcome {
  int code = -1;
  QString out;
  QString err;
};

class Installation {
 public:
  // `defaults` joins the environment of every run (before a run's own `extra`).
  explicit Installation(const QMap<QString, QString>& defaults = {}) : defaults_(defaults) {
    for (const char* sub : {"data", "config", "runtime"}) QDir(home_.path()).mkpath(QString::fromLatin1(sub));
    // A runtime folder must be the user's alone, or Qt looks elsewhere.
    QFile::setPermissions(runtimeFolder(), QFile::ReadOwner | QFile::WriteOwner | QFile::ExeOwner);
  }
  QString path(const QString& name) const { return home_.filePath(name); }
  QString storePath() const { return path("data/Tessal2/Tessal.sqlite"); }
  // The sync journal's rows in the store, "uuid section changes" a line (a pending deletion "uuid x").
  QStringList journal() const {
    QStringList lines;
    if (auto store = WTStore::openReadOnly(storePath(), WTStore::Check::Header)) {
      EXPECT_TRUE(store.value()
                      ->readJournal(
                          [&](const QString& uuid, char section, const QByteArray& changes) {
                            lines << uuid + ' ' + QChar::fromLatin1(section) + ' ' +
                                         QString::fromUtf8(changes);
                          },
                          [&](const QString& uuid, qint64) { lines << uuid + QStringLiteral(" x"); }, nullptr)
                      .ok());
    }
    return lines;
  }
  QString runtimeFolder() const { return path("runtime"); }
  void setSetting(const QString& key, const QString& value) {
    QSettings(path("config/Tessal/Tessal.conf"), QSettings::IniFormat).setValue(key, value);
  }
  // The context over the store (made when missing), or, `readOnly`, as a later run of `tessal` reads it.
  std::unique_ptr<WTObjectContext> openStore(bool readOnly = false) const {
    if (!readOnly) QDir().mkpath(QFileInfo(storePath()).path());
    auto context = std::make_unique<WTObjectContext>();
    auto store = readOnly ? WTStore::openReadOnly(storePath()) : WTStore::open(storePath());
    EXPECT_TRUE(store && context->attachStore(std::move(store.value())));
    return context;
  }
  std::unique_ptr<WTObjectContext> readStore() const { return openStore(true); }
  // Its folders, no display (as over ssh); `extra` added or replacing (an empty value removes).
  QProcessEnvironment environment(const QMap<QString, QString>& extra = {}) const {
    QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
    environment.insert("XDG_DATA_HOME", path("data"));
    environment.insert("XDG_CONFIG_HOME", path("config"));
    environment.insert("XDG_RUNTIME_DIR", runtimeFolder());
    for (const char* name : {"DISPLAY", "WAYLAND_DISPLAY", "QT_QPA_PLATFORM"}) environment.remove(name);
    QMap<QString, QString> all = defaults_;
    all.insert(extra);
    for (auto [name, value] : all.asKeyValueRange())
      value.isEmpty() ? environment.remove(name) : environment.insert(name, value);
    return environment;
  }
  // `tessal` with `arguments`, started but not waited for.
  std::unique_ptr<QProcess> launch(const QStringList& arguments,
                                   const QMap<QString, QString>& extra = {}) const {
    auto process = std::make_unique<QProcess>();
    process->setProcessEnvironment(environment(extra));
    process->start(QString::fromUtf8(TESSAL_EXE), arguments);
    return process;
  }
  static Outcome finish(QProcess& process) {
    if (!process.waitForFinished(60000)) {
      process.kill();
      process.waitForFinished();
      return {};
    }
    return {process.exitStatus() == QProcess::NormalExit ? process.exitCode() : -1,
            QString::fromUtf8(process.readAllStandardOutput()),
            QString::fromUtf8(process.readAllStandardError())};
  }
  Outcome tessal(const QStringList& arguments, const QMap<QString, QString>& extra = {}) const {
    return finish(*launch(arguments, extra));
  }
  // Runs `tessal`: exit `code`, and stdout (on success, else stderr) holds `text`.
  Outcome expect(const QStringList& arguments, int code, const QString& text,
                 const QMap<QString, QString>& extra = {}) const {
    Outcome run = tessal(arguments, extra);
    const std::string what = arguments.join(' ').toStdString() + ": " + (run.out + run.err).toStdString();
    EXPECT_EQ(run.code, code) << what;
    EXPECT_TRUE((code == 0 ? run.out : run.err).contains(text)) << what;
    return run;
  }
  // What a run printed on stdout, for exact comparisons.
  std::string out(const QStringList& arguments, const QMap<QString, QString>& extra = {}) const {
    return tessal(arguments, extra).out.toStdString();
  }
  QString file(const QString& name, const QByteArray& contents) const {
    writeFile(path(name), contents);
    return path(name);
  }

 private:
  QMap<QString, QString> defaults_;
  QTemporaryDir home_;
};

// Records as a user makes them.
inline WTProject* project(WTObjectContext& context, const QString& name, WTClient* client = nullptr) {
  auto* project = WTProject::insertNewObject(&context);
  project->setName(name);
  project->setClient(client);
  return project;
}
inline WTTask* task(WTObjectContext& context, WTProject* project, const QString& name) {
  auto* task = WTTask::insertNewObject(&context);
  task->setName(name);
  task->setProject(project);
  return task;
}
inline void addTime(WTObjectContext& context, WTTask* task, Date start, Date end) {
  auto* time = WTTime::insertNewObject(&context);
  time->setTask(task);
  time->setStartDate(start);
  time->setEndDate(end);
}

}  // namespace commandtest
