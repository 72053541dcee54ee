#include "bench/processes/child.h"

#include <fcntl.h>
#include <poll.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <cstring>
#include <ctime>
#include <fstream>
#include <stdexcept>
#include <string_view>

#include "bench/support/scratch_root.h"

namespace quorvel::bench {
namespace {

constexpr int kPatienceMilliseconds = 10'000;

Descriptor bind_report_socket(const std::string& path) {
  Descriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  ::unlink(path.c_str());
  if (::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
    throw std::runtime_error("cannot make " + path);
  }
  return socket;
}

double processor_time(pid_t process) {
  clockid_t clock{};
  timespec time{};
  if (::clock_getcpuclockid(process, &clock) != 0 || ::clock_gettime(clock, &time) != 0) return 0;
  return static_cast<double>(time.tv_sec) * 1e9 + static_cast<double>(time.tv_nsec);
}

pid_t start(const std::vector<std::string>& command) {
  posix_spawn_file_actions_t streams;
  ::posix_spawn_file_actions_init(&streams);
  for (const int stream : {0, 1, 2}) {
    ::posix_spawn_file_actions_addopen(&streams, stream, "/dev/null", O_RDWR, 0);
  }
  std::vector<char*> arguments;
  for (const std::string& word : command) arguments.push_back(const_cast<char*>(word.c_str()));
  arguments.push_back(nullptr);
  pid_t process = -1;
  const int error = ::posix_spawnp(&process, arguments[0], &streams, nullptr, arguments.data(), environ);
  ::posix_spawn_file_actions_destroy(&streams);
  if (error != 0) throw std::runtime_error("cannot start " + command[0] + ": " + std::strerror(error));
  return process;
}

}  // namespace

Child::Child(const std::vector<std::string>& command, bool reports) {
  const std::string path = scratch_root().outside() / "ready";
  const Descriptor socket = bind_report_socket(path);
  ::setenv("NOTIFY_SOCKET", path.c_str(), 1);
  const auto started = std::chrono::steady_clock::now();
  pid_ = start(command);
  if (!reports) return;
  await_report(socket.get());
  time_to_ready_ = std::chrono::duration<double, std::nano>(std::chrono::steady_clock::now() - started).count();
  processor_time_to_ready_ = processor_time(pid_);
}

void Child::await_report(int socket) {
  char report[4096];
  pollfd ready{socket, POLLIN, 0};
  while (::poll(&ready, 1, kPatienceMilliseconds) == 1) {
    const ssize_t length = ::recv(socket, report, sizeof report, 0);
    if (length > 0 && std::string_view(report, static_cast<std::size_t>(length)).find("READY=1") != std::string::npos) {
      return;
    }
  }
  ::kill(pid_, SIGKILL);
  ::waitpid(pid_, nullptr, 0);
  throw std::runtime_error("a program did not report that it is ready");
}

Child::~Child() {
  ::kill(pid_, SIGTERM);
  ::waitpid(pid_, nullptr, 0);
}

Child::Memory Child::memory() const {
  std::ifstream rollup("/proc/" + std::to_string(pid_) + "/smaps_rollup");
  Memory memory{};
  double kilobytes = 0;
  for (std::string word; rollup >> word;) {
    if (word != "Rss:" && word != "Pss:") continue;
    rollup >> kilobytes;
    (word == "Rss:" ? memory.resident : memory.proportional) = kilobytes * 1024;
  }
  if (memory.resident == 0) throw std::runtime_error("cannot tell the memory of a program");
  return memory;
}

}  // namespace quorvel::bench
