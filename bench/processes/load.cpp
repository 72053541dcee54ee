#include "bench/processes/load.h"

#include <fcntl.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <stdexcept>

#include "bench/processes/local_socket.h"

namespace quorvel::bench {
namespace {

using Clock = std::chrono::steady_clock;

double nanoseconds_since(Clock::time_point start) {
  return std::chrono::duration<double, std::nano>(Clock::now() - start).count();
}

/// A connection that has had its first reply and so knows what each will be like.
class Connection {
 public:
  explicit Connection(const Service& service)
      : socket_(connect_to(service.socket())), request_(service.request()), reply_(Service::kReplyHead) {
    greet(service);
    send_request();
    receive(Service::kReplyHead);
    reply_.resize(service.reply_length(reply_));
    receive(reply_.size());
    end_ = {reply_.end() - static_cast<std::ptrdiff_t>(std::min(kCompared, reply_.size())), reply_.end()};
  }

  [[nodiscard]] int descriptor() const { return socket_.get(); }
  [[nodiscard]] std::span<const std::byte> reply() const { return reply_; }

  void send_request() {
    received_ = 0;
    if (::send(socket_.get(), request_.data(), request_.size(), MSG_NOSIGNAL) !=
        static_cast<ssize_t>(request_.size())) {
      throw std::runtime_error("cannot send a request");
    }
  }
  /// Waits until `length` bytes of the reply are there.
  void receive(std::size_t length) {
    while (received_ < length) take(::recv(socket_.get(), reply_.data() + received_, length - received_, MSG_WAITALL));
  }
  /// Takes what is there; true when that ends the reply.
  bool receive_some() {
    take(::recv(socket_.get(), reply_.data() + received_, reply_.size() - received_, MSG_DONTWAIT));
    return received_ == reply_.size();
  }
  void check() const {
    if (std::memcmp(reply_.data() + reply_.size() - end_.size(), end_.data(), end_.size()) != 0) {
      throw std::runtime_error("a reply differs from the first");
    }
  }

 private:
  static constexpr std::size_t kCompared = 64;

  void greet(const Service& service) {
    const std::string greeting = service.greeting();
    if (::send(socket_.get(), greeting.data(), greeting.size(), MSG_NOSIGNAL) < 0) {
      throw std::runtime_error("cannot send a greeting");
    }
    char byte = 0;
    for (std::size_t lines = 0; lines < service.greeting_lines(); lines += byte == '\n' ? 1 : 0) {
      if (::recv(socket_.get(), &byte, 1, 0) != 1) throw std::runtime_error("no answer to a greeting");
    }
  }
  void take(ssize_t count) {
    if (count > 0) {
      received_ += static_cast<std::size_t>(count);
    } else if (count == 0 || (errno != EAGAIN && errno != EINTR)) {
      throw std::runtime_error("a service closed its connection");
    }
  }

  Descriptor socket_;
  std::string request_;
  std::vector<std::byte> reply_;
  std::vector<std::byte> end_;
  std::size_t received_ = 0;
};

void require_data(const Service& service, const Connection& connection, const DataSet& data) {
  if (!service.holds(connection.reply(), data)) throw std::runtime_error("a reply does not hold the data");
}

}  // namespace

double call_one_by_one(const Service& service, const DataSet& data, double seconds) {
  Connection connection(service);
  std::size_t calls = 0;
  double taken = 0;
  for (const auto start = Clock::now(); taken < seconds * 1e9; taken = nanoseconds_since(start)) {
    for (int i = 0; i < 16; ++i, ++calls) {
      connection.send_request();
      connection.receive(connection.reply().size());
      connection.check();
    }
  }
  require_data(service, connection, data);
  return taken / static_cast<double>(calls);
}

double call_at_once(const Service& service, const DataSet& data, std::size_t connections, double seconds) {
  std::vector<Connection> all;
  all.reserve(connections);
  const Descriptor queue(::epoll_create1(EPOLL_CLOEXEC));
  for (std::size_t i = 0; i < connections; ++i) {
    Connection& connection = all.emplace_back(service);
    epoll_event interest{EPOLLIN, {.ptr = &connection}};
    ::epoll_ctl(queue.get(), EPOLL_CTL_ADD, connection.descriptor(), &interest);
  }
  for (Connection& connection : all) connection.send_request();
  std::size_t calls = 0, under_way = connections;
  const auto start = Clock::now();
  double taken = 0;
  std::vector<epoll_event> events(connections);
  while (under_way > 0) {
    const int count = ::epoll_wait(queue.get(), events.data(), static_cast<int>(events.size()), 10'000);
    if (count == 0) throw std::runtime_error("a service does not reply");
    taken = nanoseconds_since(start);
    for (const epoll_event& event : std::span(events).first(static_cast<std::size_t>(std::max(count, 0)))) {
      auto& connection = *static_cast<Connection*>(event.data.ptr);
      if (!connection.receive_some()) continue;
      connection.check();
      ++calls;
      if (taken < seconds * 1e9) {
        connection.send_request();
      } else {
        --under_way;
      }
    }
  }
  taken = nanoseconds_since(start);
  for (const Connection& connection : all) require_data(service, connection, data);
  return taken / static_cast<double>(calls);
}

}  // namespace quorvel::bench
