#include <sys/socket.h>
#include <unistd.h>

#include <fstream>
#include <stdexcept>

#include "bench/contenders/quorvel_codec.h"
#include "bench/processes/child.h"
#include "bench/processes/local_socket.h"
#include "bench/processes/program.h"
#include "bench/support/files.h"
#include "bench/support/scratch_root.h"

namespace quorvel::bench {
namespace {

namespace fs = std::filesystem;

bool is_installed(const char* program) {
  for (const char* directory : {"/usr/bin", "/usr/local/bin", "/usr/sbin"}) {
    if (::access((fs::path(directory) / program).c_str(), X_OK) == 0) return true;
  }
  return false;
}

class Daemon : public StartedProgram {
 public:
  explicit Daemon(std::size_t entries)
      : entries_(entries), encoded_(QuorvelCodec::encode(to_property(data_set(entries)))) {}
  [[nodiscard]] std::string name() const override { return std::string(kOurs); }
  [[nodiscard]] std::size_t entries() const override { return entries_; }
  void prepare() override { write_file(scratch_root().data_file(), encoded_.bytes()); }
  [[nodiscard]] std::vector<std::string> command() const override { return {QUORVELD_PATH}; }

 private:
  std::size_t entries_;
  ByteBuffer encoded_;
};

class DbusDaemon : public StartedProgram {
 public:
  DbusDaemon() {
    std::ofstream(configuration()) << "<busconfig><type>session</type><listen>unix:path="
                                   << (scratch_root().outside() / "dbus.sock").string()
                                   << "</listen><policy context=\"default\"><allow send_destination=\"*\"/>"
                                      "<allow own=\"*\"/></policy></busconfig>\n";
  }
  [[nodiscard]] std::string name() const override { return "dbus-daemon"; }
  [[nodiscard]] std::size_t entries() const override { return 100; }
  void prepare() override { fs::remove(scratch_root().outside() / "dbus.sock"); }
  [[nodiscard]] std::vector<std::string> command() const override {
    return {"dbus-daemon", "--config-file=" + configuration().string(), "--nofork", "--nopidfile", "--nosyslog"};
  }

 private:
  static fs::path configuration() { return scratch_root().outside() / "dbus.conf"; }
};

class RedisServer : public StartedProgram {
 public:
  explicit RedisServer(std::size_t entries) : entries_(entries) {
    std::ofstream(configuration()) << "port 0\nunixsocket " << socket().string() << "\ndir "
                                   << scratch_root().outside().string() << "\ndbfilename redis.rdb\nsave \"\"\n"
                                   << "supervised systemd\nlogfile /dev/null\n";
    const Child server(command());
    fill();
  }
  [[nodiscard]] std::string name() const override { return "redis-server"; }
  [[nodiscard]] std::size_t entries() const override { return entries_; }
  [[nodiscard]] std::vector<std::string> command() const override { return {"redis-server", configuration()}; }

 private:
  static fs::path configuration() { return scratch_root().outside() / "redis.conf"; }
  static fs::path socket() { return scratch_root().outside() / "redis.sock"; }

  /// A value as the bytes that redis keeps: each value of a collection behind the other.
  struct Text {
    std::string operator()(const std::string& text) const { return text; }
    std::string operator()(std::int64_t number) const { return std::to_string(number); }
    std::string operator()(bool truth) const { return truth ? "1" : "0"; }
    std::string operator()(const Bytes& bytes) const { return {bytes.begin(), bytes.end()}; }
    std::string operator()(const Date& date) const { return std::to_string(date.seconds); }
    std::string operator()(const Array& elements) const {
      std::string text;
      for (const Value& element : elements) text += std::visit(*this, element.content);
      return text;
    }
    std::string operator()(const Dictionary& members) const {
      std::string text;
      for (const auto& [key, value] : members) text += key + std::visit(*this, value.content);
      return text;
    }
  };

  static std::string word(const std::string& text) {
    return "$" + std::to_string(text.size()) + "\r\n" + text + "\r\n";
  }

  /// Sets every entry and has them saved; each is answered with one line, the same for all.
  void fill() const {
    std::string commands;
    for (const Entry& entry : data_set(entries_)) {
      commands += "*3\r\n" + word("SET") + word(entry.store_key) + word(std::visit(Text{}, entry.value.content));
    }
    commands += "*1\r\n" + word("SAVE");
    const Descriptor connection = connect_to(socket());
    std::size_t sent = 0, received = 0;
    const std::string answer = "+OK\r\n";
    std::string answers((entries_ + 1) * answer.size(), '\0');
    while (received < answers.size()) {
      if (sent < commands.size()) {
        const ssize_t count =
            ::send(connection.get(), commands.data() + sent, commands.size() - sent, MSG_DONTWAIT | MSG_NOSIGNAL);
        if (count > 0) sent += static_cast<std::size_t>(count);
      }
      const ssize_t count = ::recv(connection.get(), answers.data() + received, answers.size() - received,
                                   sent < commands.size() ? MSG_DONTWAIT : 0);
      if (count == 0) break;
      if (count > 0) received += static_cast<std::size_t>(count);
    }
    for (std::size_t at = 0; at < answers.size(); at += answer.size()) {
      if (answers.compare(at, answer.size(), answer) != 0)
        throw std::runtime_error("redis-server did not take the data");
    }
  }

  std::size_t entries_;
};

}  // namespace

std::vector<std::unique_ptr<StartedProgram>> make_programs() {
  std::vector<std::unique_ptr<StartedProgram>> programs;
  for (const std::size_t entries : {100u, 10'000u, 100'000u}) programs.push_back(std::make_unique<Daemon>(entries));
  if (is_installed("dbus-daemon")) programs.push_back(std::make_unique<DbusDaemon>());
  if (is_installed("redis-server")) programs.push_back(std::make_unique<RedisServer>(10'000));
  return programs;
}

}  // namespace quorvel::bench
