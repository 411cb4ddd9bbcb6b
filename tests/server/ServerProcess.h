#pragma once

// A tessal-sync-server process on a free loopback port, for runs that kill it with -9 and start it
// again. Plain POSIX, so a program without Qt or GoogleTest can use it too.
#include <poll.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <string>
#include <utility>

namespace servertest {

class ServerProcess {
 public:
  ServerProcess(std::string executable, std::string location)
      : executable_(std::move(executable)), location_(std::move(location)) {}
  ~ServerProcess() { kill(); }
  ServerProcess(const ServerProcess&) = delete;
  ServerProcess& operator=(const ServerProcess&) = delete;

  // Starts `serve` and waits for the address it prints. False when it does not come within 10 s.
  bool start(int threads = 8) {
    kill();
    int out[2];
    if (pipe(out) != 0) return false;
    const std::string workers = std::to_string(threads);
    pid_ = fork();
    if (pid_ == 0) {
      dup2(out[1], STDOUT_FILENO);
      close(out[0]);
      close(out[1]);
      execl(executable_.c_str(), executable_.c_str(), "serve", "--listen", "127.0.0.1:0", "--db",
            location_.c_str(), "--threads", workers.c_str(), static_cast<char*>(nullptr));
      _exit(127);
    }
    close(out[1]);
    std::string line;
    for (char c = 0; pid_ > 0 && c != '\n';) {
      pollfd readable{out[0], POLLIN, 0};
      if (poll(&readable, 1, 10000) != 1 || read(out[0], &c, 1) != 1) break;
      line += c;
    }
    close(out[0]);
    const size_t colon = line.rfind(':');
    port_ = colon == std::string::npos ? 0 : std::atoi(line.c_str() + colon + 1);
    if (port_ <= 0) kill();
    return port_ > 0;
  }

  // SIGKILL, whatever it is doing, and reaps it.
  void kill() {
    if (pid_ > 0) ::kill(pid_, SIGKILL), waitpid(pid_, nullptr, 0);
    pid_ = -1, port_ = 0;
  }

  bool running() const { return pid_ > 0; }
  int port() const { return port_; }  // 0 while not running

 private:
  std::string executable_, location_;
  pid_t pid_ = -1;
  int port_ = 0;
};

}  // namespace servertest
