#include "daemon_process.h"

#include <pwd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cmath>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <set>
#include <sstream>

#include "client/core/service_socket.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"

namespace quorvel::tools {
namespace {

constexpr pid_t kServiceManager = 1;

std::string proc_path(pid_t process, const char* name) { return "/proc/" + std::to_string(process) + '/' + name; }

// A line of a process's list of local sockets.
struct LocalSocket {
  std::string flags, type, state, inode, path;
  [[nodiscard]] bool listens() const { return flags == "00010000"; }
  [[nodiscard]] bool is_connected_stream() const { return type == "0001" && state == "03"; }
  // As descriptors' links in /proc name it.
  [[nodiscard]] std::string link() const { return "socket:[" + inode + ']'; }
};

// The links of the sockets in a process's network that `wanted` is true of; nothing where /proc does not tell.
template <typename Wanted>
std::optional<std::set<std::string>> sockets_of(pid_t process, Wanted wanted) {
  std::set<std::string> links;
  std::ifstream table(proc_path(process, "net/unix"));
  if (!table) return std::nullopt;
  std::string line;
  std::getline(table, line);
  while (std::getline(table, line)) {
    std::istringstream columns(line);
    std::string number, references, protocol;
    LocalSocket socket;
    columns >> number >> references >> protocol >> socket.flags >> socket.type >> socket.state >> socket.inode;
    std::getline(columns >> std::ws, socket.path);
    if (wanted(socket)) links.insert(socket.link());
  }
  return links;
}

// Whether a process holds one of the sockets behind its standard streams, which are the caller's or the journal's;
// nothing where the caller may not look.
std::optional<bool> holds_one_of(pid_t process, const std::set<std::string>& links) {
  std::error_code error;
  bool found = false;
  std::filesystem::directory_iterator entry(proc_path(process, "fd"), error);
  if (error) return std::nullopt;
  for (; entry != std::filesystem::directory_iterator(); entry.increment(error)) {
    const std::string name = entry->path().filename().string();
    std::error_code gone;
    const std::string target = std::filesystem::read_symlink(entry->path(), gone).string();
    if (!(name.size() == 1 && name <= "2") && !gone && links.contains(target)) found = true;
  }
  return found;
}

// A service manager that listens for a service is its peer; the service holds the socket as well once it runs.
pid_t holder_of(const char* path) {
  const auto links = sockets_of(1, [path](const LocalSocket& one) { return one.listens() && one.path == path; });
  std::error_code error;
  std::filesystem::directory_iterator entry("/proc", error);
  if (!links || links->empty() || error) return kServiceManager;
  for (; entry != std::filesystem::directory_iterator(); entry.increment(error)) {
    const pid_t process = std::atoi(entry->path().filename().c_str());
    if (process > kServiceManager && holds_one_of(process, *links).value_or(false)) return process;
  }
  return kServiceManager;
}

}  // namespace

Server server_of(std::string_view service) {
  Server server;
  client::ServiceSocket socket;
  client::Failure failure;
  if (!socket.open(nullptr, service, failure)) return {Server::State::unreachable, 0, 0, failure.sentence};
  switch (socket.connect(failure)) {
    case client::ServiceSocket::Step::busy: return {Server::State::refused, 0, 0, "it takes no more connections"};
    case client::ServiceSocket::Step::failed:
      return {failure.code == client::ErrorCode::service_absent ? Server::State::absent : Server::State::unreachable, 0,
              0, failure.sentence};
    case client::ServiceSocket::Step::connected: break;
  }
  ucred peer{};
  socklen_t size = sizeof peer;
  if (::getsockopt(socket.descriptor(), SOL_SOCKET, SO_PEERCRED, &peer, &size) != 0) peer = {};
  const bool is_managed = peer.pid == kServiceManager && peer.uid == 0;
  return {Server::State::serving, is_managed ? holder_of(socket.path()) : peer.pid, peer.uid, {}};
}

bool is_believed(const Server& service) {
  struct stat directory {};
  if (service.state != Server::State::serving) return false;
  if (service.user == 0) return true;
  return platform::file_status(paths::kServiceDirectory, &directory) == 0 && service.user == directory.st_uid;
}

std::string user_name(uid_t user) {
  const passwd* entry = ::getpwuid(user);
  return entry != nullptr ? entry->pw_name : std::to_string(user);
}

std::string program_of(pid_t process) {
  std::ifstream file(proc_path(process, "cmdline"));
  std::string program;
  std::getline(file, program, '\0');
  return program.erase(0, program.rfind('/') + 1);
}

std::string name_of(const Server& server) {
  if (server.process <= 0) return "a process of user " + user_name(server.user);
  if (server.process == kServiceManager) return "a service of the service manager, process 1";
  const std::string program = program_of(server.process);
  return program + (program.empty() ? "" : ", ") + "process " + std::to_string(server.process) + " of user " +
         user_name(server.user);
}

std::optional<double> start_of(pid_t process) {
  std::ifstream file(proc_path(process, "stat"));
  std::string text{std::istreambuf_iterator<char>(file), {}};
  const std::size_t name_end = text.rfind(')');
  if (name_end == std::string::npos) return std::nullopt;
  // The twenty-second field, counted from the second, which is the name.
  std::istringstream fields(text.substr(name_end + 1));
  std::string field;
  for (int i = 3; i <= 22; ++i) fields >> field;
  timespec now{}, up{};
  if (!fields || ::clock_gettime(CLOCK_REALTIME, &now) != 0 || ::clock_gettime(CLOCK_BOOTTIME, &up) != 0) {
    return std::nullopt;
  }
  const double ticks = static_cast<double>(std::strtoull(field.c_str(), nullptr, 10));
  const double boot = static_cast<double>(now.tv_sec - up.tv_sec) + static_cast<double>(now.tv_nsec - up.tv_nsec) / 1e9;
  return std::floor(boot + ticks / static_cast<double>(::sysconf(_SC_CLK_TCK)));
}

std::optional<bool> follows_telephony(pid_t daemon) {
  // A connection that a service accepted has the service's name, one of the process's own making has none.
  const auto own = [](const LocalSocket& one) { return one.is_connected_stream() && one.path.empty(); };
  const std::optional<std::set<std::string>> connections = sockets_of(daemon, own);
  return connections ? holds_one_of(daemon, *connections) : std::nullopt;
}

}  // namespace quorvel::tools
