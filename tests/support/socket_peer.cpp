#include "support/socket_peer.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/un.h>

#include "linux/base/local_socket.h"
#include "property/binary/binary.h"

namespace quorvel::test {

namespace {

bool wait_for(int descriptor, short events, std::chrono::milliseconds patience) {
  pollfd wanted = {descriptor, events, 0};
  return ::poll(&wanted, 1, static_cast<int>(patience.count())) == 1;
}

}  // namespace

std::string frame_bytes(wire::FrameKind kind, std::uint64_t serial, std::string_view name, const PropertyValue& value,
                        std::uint8_t flags) {
  ByteBuffer out;
  if (!wire::append_frame(kind, flags, serial, name, value, out)) throw std::runtime_error("no such frame");
  return {reinterpret_cast<const char*>(out.data()), out.size()};
}

SocketPeer SocketPeer::connected_to(std::string_view name) { return SocketPeer(platform::host::connect_local(name)); }

bool SocketPeer::send(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t count = ::send(descriptor(), bytes.data(), bytes.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
    if (count > 0)
      bytes.remove_prefix(static_cast<std::size_t>(count));
    else if (errno != EAGAIN || !wait_for(descriptor(), POLLOUT, kPatience))
      return false;
  }
  return true;
}

void SocketPeer::end_sending() { ::shutdown(descriptor(), SHUT_WR); }

bool SocketPeer::read_more(std::chrono::milliseconds patience) {
  if (!wait_for(descriptor(), POLLIN, patience)) return false;
  const std::span<std::byte> room = input_.room(65536, SIZE_MAX);
  const ssize_t count = ::recv(descriptor(), room.data(), room.size(), MSG_DONTWAIT);
  if (count > 0) input_.arrived(static_cast<std::size_t>(count));
  return count > 0;
}

std::optional<ReceivedFrame> SocketPeer::receive(std::chrono::milliseconds patience) {
  for (;;) {
    wire::Frame frame;
    const wire::FrameResult result = input_.next(UINT32_MAX, frame);
    if (result == wire::FrameResult::refused) throw std::runtime_error("a frame that is none");
    if (result == wire::FrameResult::complete) {
      ReceivedFrame received{frame.head.kind, frame.head.serial, std::string(frame.name), nullptr};
      if (!frame.payload.empty()) received.value = read_binary(frame.payload, Mutability::immutable);
      return received;
    }
    if (!read_more(patience)) return std::nullopt;
  }
}

bool SocketPeer::is_closed(std::chrono::milliseconds patience) {
  if (input_.look(UINT32_MAX) == wire::FrameResult::complete || !wait_for(descriptor(), POLLIN, patience)) return false;
  char byte;
  const ssize_t count = ::recv(descriptor(), &byte, 1, MSG_DONTWAIT);
  return count == 0 || (count < 0 && errno == ECONNRESET);
}

Descriptor listen_on(std::string_view name) {
  const Descriptor directory = platform::host::open_service_directory();
  const std::string path = "/proc/self/fd/" + std::to_string(directory.get()) + "/" + std::string(name);
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  ::unlink(path.c_str());
  Descriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
      ::listen(socket.get(), 16) != 0)
    throw std::runtime_error("cannot listen on " + path);
  return socket;
}

SocketPeer accept_from(const Descriptor& listener, std::chrono::milliseconds patience) {
  if (!wait_for(listener.get(), POLLIN, patience)) return SocketPeer(Descriptor());
  return SocketPeer(Descriptor(::accept4(listener.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK)));
}

ssize_t send_attached(int socket, std::string_view bytes, std::span<const int> attached) {
  iovec part = {const_cast<char*>(bytes.data()), bytes.size()};
  alignas(cmsghdr) char control[CMSG_SPACE(16 * sizeof(int))] = {};
  msghdr message = {};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control;
  message.msg_controllen = CMSG_SPACE(attached.size_bytes());
  if (message.msg_controllen > sizeof control) throw std::runtime_error("too much to attach");
  cmsghdr* const header = CMSG_FIRSTHDR(&message);
  header->cmsg_level = SOL_SOCKET;
  header->cmsg_type = SCM_RIGHTS;
  header->cmsg_len = CMSG_LEN(attached.size_bytes());
  std::memcpy(CMSG_DATA(header), attached.data(), attached.size_bytes());
  return ::sendmsg(socket, &message, MSG_DONTWAIT | MSG_NOSIGNAL);
}

FakeService::FakeService(std::string_view name, std::vector<std::string> pieces, bool hold, int clients)
    : listener_(listen_on(name)), thread_([this, sent = std::move(pieces), hold, clients] {
        for (int client = 0; client < clients; ++client) {
          SocketPeer peer = accept_from(listener_);
          for (const std::string& piece : sent) {
            peer.send(piece);
            std::this_thread::sleep_for(1ms);
          }
          while (hold && peer.receive()) continue;
        }
      }) {}

}  // namespace quorvel::test
