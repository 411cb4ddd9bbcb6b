// tessal-sync-server: the command line around SyncServer.
#include "SyncServer.h"

#include <csignal>
#include <cstdlib>
#include <iostream>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include <malloc.h>
#include <pthread.h>
#include <sys/resource.h>

using tessal::server::PasswordAuthenticator;
using tessal::server::SyncServer;
using tessal::server::SyncStore;

namespace {

constexpr const char* kUsage =
    "usage:\n"
    "  tessal-sync-server serve --listen HOST:PORT --db LOCATION [--threads N] [--max-body BYTES]\n"
    "      [--body-memory BYTES] [--connections-per-address N] [--no-signup]\n"
    "  tessal-sync-server add-user EMAIL --db LOCATION      (reads the password from standard input)\n"
    "LOCATION is a SQLite file (created when missing) or a postgresql:// connection URI.\n"
    "PORT 0 picks a free port; the address served is printed on standard output.\n"
    "--max-body caps one request's body (default 33554432), --body-memory all bodies being read or\n"
    "answered together (default 100663296; past it: 503). --connections-per-address caps the\n"
    "connections one address (an IPv6 /64) holds, the rest answered 503 at once (default 256, 0: no\n"
    "cap; behind a proxy on this host, raise it to the proxy's connections or use 0).\n";

// What was wrong with the arguments, then how they go.
int usage(const std::string& problem) {
  std::cerr << "tessal-sync-server: " << problem << "\n" << kUsage;
  return 2;
}

std::string unexpected(const std::string& argument) {
  static const std::set<std::string> valued = {"--listen",   "--db",          "--threads",
                                               "--max-body", "--body-memory", "--connections-per-address"};
  return valued.count(argument) ? argument + " needs a value" : "unexpected “" + argument + "”";
}

std::optional<long long> number(const std::string& text) {
  try {
    size_t used = 0;
    const long long value = std::stoll(text, &used);
    if (used != text.size() || value < 0) return std::nullopt;
    return value;
  } catch (const std::exception&) {
    return std::nullopt;
  }
}

// "127.0.0.1:8080" or "[::1]:8080".
bool splitListen(const std::string& listen, std::string& host, int& port) {
  const size_t colon = listen.rfind(':');
  if (colon == std::string::npos || colon == 0) return false;
  host = listen.substr(0, colon);
  if (host.size() > 2 && host.front() == '[' && host.back() == ']') host = host.substr(1, host.size() - 2);
  const std::optional<long long> value = number(listen.substr(colon + 1));
  if (!value || *value > 65535) return false;
  port = static_cast<int>(*value);
  return true;
}

int serve(const std::vector<std::string>& args) {
  std::string listen, location;
  SyncServer::Options options;
  for (size_t i = 0; i < args.size(); ++i) {
    const std::string& arg = args[i];
    const bool hasValue = i + 1 < args.size();
    if (arg == "--listen" && hasValue) {
      listen = args[++i];
    } else if (arg == "--db" && hasValue) {
      location = args[++i];
    } else if (arg == "--threads" && hasValue) {
      const auto value = number(args[++i]);
      if (!value || *value < 2 || *value > 1024) return usage("--threads takes a number from 2 to 1024");
      options.threads = static_cast<int>(*value);
    } else if (arg == "--max-body" && hasValue) {
      const auto value = number(args[++i]);
      if (!value || *value < 1024) return usage("--max-body takes a number of bytes, 1024 or more");
      options.maxBodyBytes = static_cast<size_t>(*value);
    } else if (arg == "--body-memory" && hasValue) {
      const auto value = number(args[++i]);
      if (!value || *value < 1024) return usage("--body-memory takes a number of bytes, 1024 or more");
      options.limits.maxBodyMemory = static_cast<size_t>(*value);
    } else if (arg == "--connections-per-address" && hasValue) {
      const auto value = number(args[++i]);
      if (!value) return usage("--connections-per-address takes a number");
      options.limits.maxConnectionsPerAddress = static_cast<size_t>(*value);
    } else if (arg == "--no-signup") {
      options.signUp = false;
    } else {
      return usage(unexpected(arg));
    }
  }
  if (listen.empty()) return usage("--listen HOST:PORT is needed");
  if (location.empty()) return usage("--db LOCATION is needed");
  if (!splitListen(listen, options.host, options.port))
    return usage("“" + listen + "” is not HOST:PORT with a port up to 65535");

  // Signals are taken by this thread alone, so block them before any worker exists.
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGINT);
  sigaddset(&signals, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  std::signal(SIGPIPE, SIG_IGN);
  // Bodies and replies of a megabyte or more get pages of their own, which go back to the system the
  // moment they are freed; by default the allocator raises this threshold after each large free, and
  // a burst of large requests then leaves the process at its peak.
  mallopt(M_MMAP_THRESHOLD, 1 << 20);
  // Every open connection is a descriptor; the usual soft limit of 1,024 is below the connections the
  // server is meant to hold.
  rlimit files{};
  if (getrlimit(RLIMIT_NOFILE, &files) == 0 && files.rlim_cur < files.rlim_max) {
    files.rlim_cur = files.rlim_max;
    setrlimit(RLIMIT_NOFILE, &files);
  }

  std::string error;
  std::unique_ptr<SyncServer> server = SyncServer::create(location, options, error);
  if (!server) {
    std::cerr << "tessal-sync-server: cannot open " << location << ": " << error << "\n";
    return 1;
  }
  if (!server->start(error)) {
    std::cerr << "tessal-sync-server: " << error << "\n";
    return 1;
  }
  const bool v6 = options.host.find(':') != std::string::npos;
  std::cout << "tessal-sync-server: listening on http://" << (v6 ? "[" : "") << options.host
            << (v6 ? "]" : "") << ":" << server->port() << std::endl;
  int received = 0;
  sigwait(&signals, &received);
  server->stop();
  return 0;
}

int addUser(const std::vector<std::string>& args) {
  std::string email, location;
  for (size_t i = 0; i < args.size(); ++i) {
    if (args[i] == "--db" && i + 1 < args.size()) {
      location = args[++i];
    } else if (email.empty() && args[i].rfind("--", 0) != 0) {
      email = args[i];
    } else {
      return usage(unexpected(args[i]));
    }
  }
  if (email.empty()) return usage("the account's e-mail address is needed");
  if (location.empty()) return usage("--db LOCATION is needed");
  std::string password;
  std::getline(std::cin, password);

  std::string error;
  std::unique_ptr<SyncStore> store = SyncStore::open(location, error);
  if (!store) {
    std::cerr << "tessal-sync-server: cannot open " << location << ": " << error << "\n";
    return 1;
  }
  PasswordAuthenticator authenticator(*store);
  switch (authenticator.createAccount(email, password)) {
    case PasswordAuthenticator::SignUp::Created:
      std::cout << "tessal-sync-server: account "
                << PasswordAuthenticator::normaliseEmail(email).value_or(email) << " created\n";
      return 0;
    case PasswordAuthenticator::SignUp::BadEmail:
      std::cerr << "tessal-sync-server: not an e-mail address\n";
      break;
    case PasswordAuthenticator::SignUp::BadPassword:
      std::cerr << "tessal-sync-server: the password needs at least 8 characters\n";
      break;
    case PasswordAuthenticator::SignUp::PasswordTooLong:
      std::cerr << "tessal-sync-server: the password is too long: at most 1024 bytes\n";
      break;
    case PasswordAuthenticator::SignUp::Exists:
      std::cerr << "tessal-sync-server: there already is an account for this address\n";
      break;
    case PasswordAuthenticator::SignUp::Unavailable:
      std::cerr << "tessal-sync-server: storage failed\n";
      break;
  }
  return 1;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) return usage("name a command: serve or add-user");
  const std::string command = argv[1];
  if (command == "--help" || command == "-h") {
    std::cout << kUsage;
    return 0;
  }
  const std::vector<std::string> args(argv + 2, argv + argc);
  if (command == "serve") return serve(args);
  if (command == "add-user") return addUser(args);
  return usage("there is no command “" + command + "”");
}
