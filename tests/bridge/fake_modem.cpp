#include "bridge/fake_modem.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <sys/un.h>

namespace quorvel::test {

namespace {

const std::string kIccid = "AT+CRSM=176,12258,0,0,10";

}  // namespace

FakeModem::FakeModem(const std::string& name)
    : port_("abstract:" + name),
      listener_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)),
      ending_(::eventfd(0, EFD_CLOEXEC)) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  port_.copy(address.sun_path + 1, sizeof address.sun_path - 2);
  const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + 1 + port_.size());
  if (::bind(listener_.get(), reinterpret_cast<sockaddr*>(&address), length) != 0 ||
      ::listen(listener_.get(), 4) != 0) {
    throw std::runtime_error("no socket for the fake modem");
  }
  answers_ = {{"AT+CGMR", "FW 1.2.3"},
              {"AT+CGSN", "490154203237518"},
              {"AT+CNUM", "+CNUM: \"\",\"+4915112345678\",145"},
              {"AT+CRSM=176,28478,0,0,0", "+CRSM: 144,0,\"AB12\""}};
  thread_ = std::thread([this] { run(); });
}

FakeModem::~FakeModem() {
  const std::uint64_t one = 1;
  static_cast<void>(!::write(ending_.get(), &one, sizeof one));
  thread_.join();
}

void FakeModem::answer(const std::string& command, const std::string& text) {
  const std::lock_guard hold(mutex_);
  answers_[command] = text;
}

void FakeModem::insert(const std::string& swapped_iccid, const std::string& imsi) {
  answer("AT+CPIN?", "+CPIN: READY");
  answer(kIccid, "+CRSM: 144,0,\"" + swapped_iccid + "\"");
  answer("AT+CIMI", imsi);
}

void FakeModem::eject() {
  answer("AT+CPIN?", "+CME ERROR: 10");
  answer(kIccid, "+CME ERROR: 10");
  answer("AT+CIMI", "+CME ERROR: 10");
}

void FakeModem::report_swap() {
  const std::lock_guard hold(mutex_);
  constexpr std::string_view kReport = "\r\n+QUSIM: 1\r\n";
  for (const Descriptor& connection : connections_) {
    static_cast<void>(::send(connection.get(), kReport.data(), kReport.size(), MSG_NOSIGNAL));
  }
}

std::string FakeModem::answer_to(const std::string& command) {
  if (command == "AT+CPIN=\"1234\"") {
    answers_["AT+CPIN?"] = "+CPIN: READY";
    answers_["AT+CIMI"] = "262029999999999";
    return "\r\nOK\r\n";
  }
  if (command.starts_with("AT+CPIN=")) return "\r\n+CME ERROR: 16\r\n";
  const auto found = answers_.find(command);
  if (found == answers_.end()) return "\r\nERROR\r\n";
  if (found->second.starts_with("+CME")) return "\r\n" + found->second + "\r\n";
  return "\r\n" + found->second + "\r\n\r\nOK\r\n";
}

void FakeModem::run() {
  std::map<int, std::string> input;
  for (;;) {
    std::vector<pollfd> waits = {{ending_.get(), POLLIN, 0}, {listener_.get(), POLLIN, 0}};
    for (const Descriptor& connection : connections_) waits.push_back({connection.get(), POLLIN, 0});
    ::poll(waits.data(), waits.size(), -1);
    if (waits[0].revents != 0) return;
    const std::lock_guard hold(mutex_);
    for (std::size_t i = 2; i < waits.size(); ++i) {
      if (waits[i].revents == 0) continue;
      char bytes[1024];
      const ssize_t count = ::recv(waits[i].fd, bytes, sizeof bytes, MSG_DONTWAIT);
      std::string& text = input[waits[i].fd];
      if (count > 0) text.append(bytes, static_cast<std::size_t>(count));
      for (std::size_t end; (end = text.find('\r')) != std::string::npos; text.erase(0, end + 1)) {
        const std::size_t start = text.find_first_not_of("\n\r");
        const std::string reply = answer_to(start < end ? text.substr(start, end - start) : "");
        static_cast<void>(::send(waits[i].fd, reply.data(), reply.size(), MSG_NOSIGNAL));
      }
      if (count <= 0) {
        input.erase(waits[i].fd);
        std::erase_if(connections_, [&](const Descriptor& connection) { return connection.get() == waits[i].fd; });
      }
    }
    if (waits[1].revents != 0) connections_.emplace_back(::accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC));
  }
}

}  // namespace quorvel::test
