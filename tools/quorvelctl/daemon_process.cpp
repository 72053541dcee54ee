#include "daemon_process.h"

#include <pwd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cmath>
#include <csignal>
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

// The stream sockets in a process's network that are connected and have no name: a connection that a service accepted
// has the service's name. Nothing where /proc does not tell.
std::optional<std::set<std::string>> unnamed_connections(pid_t process) {
  std::set<std::string> inodes;
  std::ifstream table(proc_path(process, "net/unix"));
  if (!table) return std::nullopt;
  std::string line;
  std::getline(table, line);
  while (std::getline(table, line)) {
    std::istringstream columns(line);
    std::string number, references, protocol, flags, type, state, inode, path;
    columns >> number >> references >> protocol >> flags >> type >> state >> inode >> path;
    if (type == "0001" && state == "03" && path.empty()) inodes.insert("socket:[" + inode + ']');
  }
  return inodes;
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
  return {Server::State::serving, peer.pid, peer.uid, {}};
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

bool has_ended(const Server& server) { return server.process > 0 && ::kill(server.process, 0) != 0 && errno == ESRCH; }

std::string program_of(pid_t process) {
  std::ifstream file(proc_path(process, "cmdline"));
  std::string program;
  std::getline(file, program, '\0');
  return program.erase(0, program.rfind('/') + 1);
}

std::string name_of(const Server& server) {
  if (server.process <= 0) return "a process of user " + user_name(server.user);
  if (server.process == kServiceManager) return "a service that the service manager starts";
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
  const auto ticks = static_cast<double>(std::strtoull(field.c_str(), nullptr, 10));
  const double boot = static_cast<double>(now.tv_sec - up.tv_sec) + static_cast<double>(now.tv_nsec - up.tv_nsec) / 1e9;
  return std::floor(boot + ticks / static_cast<double>(::sysconf(_SC_CLK_TCK)));
}

std::optional<bool> follows_telephony(pid_t daemon) {
  const std::optional<std::set<std::string>> connections = unnamed_connections(daemon);
  std::error_code error;
  bool found = false;
  std::filesystem::directory_iterator entry(proc_path(daemon, "fd"), error);
  if (error || !connections) return std::nullopt;
  for (; entry != std::filesystem::directory_iterator(); entry.increment(error)) {
    // The first three are the caller's or the journal's.
    const bool standard = entry->path().filename().string() <= "2" && entry->path().filename().string().size() == 1;
    std::error_code gone;
    const std::string target = std::filesystem::read_symlink(entry->path(), gone).string();
    if (!standard && !gone && connections->contains(target)) found = true;
  }
  return found;
}

}  // namespace quorvel::tools
