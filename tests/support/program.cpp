#include "support/program.h"

#include <poll.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <sys/wait.h>

#include <array>

namespace quorvel::test {
namespace {

int checked(long result, const char* what) {
  if (result < 0) throw std::system_error(errno, std::generic_category(), what);
  return static_cast<int>(result);
}

Descriptor memory_file(const char* name, std::string_view content = {}) {
  Descriptor file(checked(::memfd_create(name, MFD_CLOEXEC), "memfd_create"));
  if (::pwrite(file.get(), content.data(), content.size(), 0) != static_cast<ssize_t>(content.size()))
    checked(-1, "a program's input");
  return file;
}

std::string content_of(const Descriptor& file) {
  struct stat status {};
  checked(::fstat(file.get(), &status), "a program's output");
  std::string content(static_cast<std::size_t>(status.st_size), '\0');
  content.resize(static_cast<std::size_t>(checked(::pread(file.get(), content.data(), content.size(), 0), "pread")));
  return content;
}

// The datagram socket on which a service manager hears of its service.
Descriptor notification_socket(std::string& path) {
  static std::atomic<int> made = 0;
  const auto name = "quorvel-ready-" + std::to_string(::getpid()) + "-" + std::to_string(made++);
  path = std::filesystem::temp_directory_path() / name;
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof address.sun_path) throw std::runtime_error("too long for a socket: " + path);
  std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
  Descriptor socket(checked(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0), "socket"));
  checked(::bind(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof address), path.c_str());
  return socket;
}

std::vector<std::string> environment_with(const std::vector<std::pair<std::string, std::string>>& changes) {
  std::vector<std::string> entries;
  for (char** entry = environ; *entry != nullptr; ++entry) entries.emplace_back(*entry);
  for (const auto& [name, value] : changes) {
    const std::string head = name + "=";
    std::erase_if(entries, [&](const std::string& entry) { return entry.starts_with(head); });
    entries.push_back(head + value);
  }
  return entries;
}

std::vector<char*> pointers_to(std::vector<std::string>& texts) {
  std::vector<char*> pointers;
  for (std::string& text : texts) pointers.push_back(text.data());
  pointers.push_back(nullptr);
  return pointers;
}

// All that the child needs, made before the fork: after it only plain system calls are safe.
struct Launch {
  std::vector<char*> arguments;
  std::vector<char*> environment;
  std::array<int, 3> standard;
};

[[noreturn]] void become_program(const Launch& launch) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  sigset_t none;
  sigemptyset(&none);
  ::sigprocmask(SIG_SETMASK, &none, nullptr);
  for (int i = 0; i < 3; ++i) ::dup2(launch.standard[static_cast<std::size_t>(i)], i);
  ::execve(launch.arguments[0], launch.arguments.data(), launch.environment.data());
  ::_exit(127);
}

pid_t launch_program(const std::string& path, const ProgramOptions& options, const std::string& notify_path,
                     std::array<int, 3> standard) {
  auto changes = options.environment;
  changes.emplace_back("NOTIFY_SOCKET", notify_path);
  std::vector<std::string> arguments = options.arguments;
  arguments.insert(arguments.begin(), path);
  std::vector<std::string> environment = environment_with(changes);
  const Launch launch{pointers_to(arguments), pointers_to(environment), standard};
  const pid_t pid = checked(::fork(), "fork");
  if (pid == 0) become_program(launch);
  return pid;
}

std::string built(const char* path, const char* name) {
  if (path == nullptr) throw std::runtime_error(std::string(name) + " is not part of this build");
  return path;
}

}  // namespace

#ifndef QUORVELD_PATH
#define QUORVELD_PATH nullptr
#endif
#ifndef TELVANE_SIM_PATH
#define TELVANE_SIM_PATH nullptr
#endif
#ifndef QUORVELCTL_PATH
#define QUORVELCTL_PATH nullptr
#endif
#ifndef QUORVEL_MODEM_BRIDGE_PATH
#define QUORVEL_MODEM_BRIDGE_PATH ""
#endif

std::string daemon_program() { return built(QUORVELD_PATH, "quorveld"); }
std::string simulator_program() { return built(TELVANE_SIM_PATH, "telvane-sim"); }
std::string control_program() { return built(QUORVELCTL_PATH, "quorvelctl"); }
std::string bridge_program() { return QUORVEL_MODEM_BRIDGE_PATH; }

Program::Program(const std::string& path, const ProgramOptions& options)
    : path_(path),
      notify_(notification_socket(notify_path_)),
      out_(memory_file("standard output")),
      err_(memory_file("standard error")) {
  const Descriptor input = memory_file("standard input", options.input);
  pid_ = launch_program(path, options, notify_path_, {input.get(), out_.get(), err_.get()});
  exit_ = Descriptor(checked(::syscall(SYS_pidfd_open, pid_, 0), "pidfd_open"));
}

Program::~Program() {
  if (!waited_for_) {
    ::kill(pid_, SIGKILL);
    ::waitpid(pid_, nullptr, 0);
  }
  ::unlink(notify_path_.c_str());
}

bool Program::wait_until_ready(std::chrono::milliseconds patience) {
  const auto deadline = std::chrono::steady_clock::now() + patience;
  while (true) {
    const auto left = deadline - std::chrono::steady_clock::now();
    const auto milliseconds = std::chrono::duration_cast<std::chrono::milliseconds>(left).count();
    pollfd watched[] = {{notify_.get(), POLLIN, 0}, {exit_.get(), POLLIN, 0}};
    if (milliseconds <= 0 || ::poll(watched, 2, static_cast<int>(milliseconds)) == 0) return false;
    char message[256];
    const ssize_t size = ::recv(notify_.get(), message, sizeof message, 0);
    if (size > 0 && std::string_view(message, static_cast<std::size_t>(size)).find("READY=1") != std::string_view::npos)
      return true;
    if (size < 0 && watched[1].revents != 0) return false;
  }
}

bool Program::wait_for_output(std::string_view text, std::chrono::milliseconds patience) const {
  return eventually([&] { return out().find(text) != std::string::npos; }, patience);
}

bool Program::running() const {
  pollfd ended{exit_.get(), POLLIN, 0};
  return ::poll(&ended, 1, 0) == 0;
}

std::string Program::out() const { return content_of(out_); }
std::string Program::err() const { return content_of(err_); }

void Program::send_signal(int signal) const {
  checked(::syscall(SYS_pidfd_send_signal, exit_.get(), signal, nullptr, 0), "sending a signal");
}

Outcome Program::wait(std::chrono::milliseconds patience) {
  if (!eventually([&] { return !running(); }, patience)) {
    ADD_FAILURE() << path_ << " did not end in time; it printed:\n" << out() << err();
    send_signal(SIGKILL);
  }
  int status = 0;
  checked(::waitpid(pid_, &status, 0), "waitpid");
  waited_for_ = true;
  return {WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status), out(), err()};
}

Outcome Program::stop() {
  send_signal(SIGTERM);
  return wait();
}

Outcome run_to_end(const std::string& path, const std::vector<std::string>& arguments, const std::string& input) {
  return Program(path, {.arguments = arguments, .input = input}).wait();
}

}  // namespace quorvel::test
