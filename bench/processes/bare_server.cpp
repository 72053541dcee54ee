// The limit of a call over a stream socket: for every request of sixteen bytes, reads a file and sends its length and
// its bytes.
//
//   bench_bare_server SOCKET FILE
#include <fcntl.h>
#include <sys/epoll.h>
#include <sys/socket.h>

#include <cstring>
#include <iostream>
#include <memory>
#include <vector>

#include "bench/processes/local_socket.h"
#include "bench/support/files.h"
#include "property/binary/format.h"

namespace quorvel::bench {
namespace {

constexpr std::size_t kHead = 16;

class BareServer {
 public:
  BareServer(const char* socket, const char* file) : listener_(listen_on(socket)), file_(file), reply_(1 << 20) {
    watch(listener_.get());
  }

  [[noreturn]] void run() {
    std::vector<epoll_event> events(64);
    for (;;) {
      const int count = ::epoll_wait(queue_.get(), events.data(), static_cast<int>(events.size()), -1);
      for (int i = 0; i < count; ++i) handle(events[static_cast<std::size_t>(i)].data.fd);
    }
  }

 private:
  void watch(int descriptor) {
    epoll_event interest{EPOLLIN, {.fd = descriptor}};
    ::epoll_ctl(queue_.get(), EPOLL_CTL_ADD, descriptor, &interest);
  }
  void handle(int descriptor) {
    if (descriptor == listener_.get()) {
      if (const int client = ::accept4(descriptor, nullptr, nullptr, SOCK_CLOEXEC); client >= 0) watch(client);
      return;
    }
    char request[kHead];
    if (::recv(descriptor, request, sizeof request, MSG_WAITALL) != static_cast<ssize_t>(sizeof request)) {
      ::close(descriptor);
      return;
    }
    const std::size_t size = read_file(file_, std::span(reply_).subspan(kHead));
    binary_format::put_integer(reply_.data(), size, 8);
    static_cast<void>(::send(descriptor, reply_.data(), kHead + size, MSG_NOSIGNAL));
  }

  Descriptor queue_{::epoll_create1(EPOLL_CLOEXEC)};
  Descriptor listener_;
  const char* file_;
  std::vector<std::byte> reply_;
};

}  // namespace
}  // namespace quorvel::bench

int main(int argc, char** argv) {
  if (argc != 3) return 2;
  try {
    quorvel::bench::BareServer(argv[1], argv[2]).run();
  } catch (const std::exception& error) {
    std::cerr << "bench_bare_server: " << error.what() << '\n';
    return 1;
  }
}
