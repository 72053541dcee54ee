#include "stress/hostile_clients.h"

#include <poll.h>
#include <sys/socket.h>

#include "protocol/quorvel_protocol.h"
#include "stress/stressed_daemon.h"

namespace quorvel::test {
namespace {

// What a client sends that means harm or knows no better. Only the last one asks for anything.
std::vector<std::string> rubbish() {
  const std::string call = image_call(1);
  const auto with_size = [&](std::string_view size) { return std::string(call).replace(0, 4, size); };
  return {
      with_size(std::string_view("\0\0\0\0", 4)),
      with_size("\xff\xff\xff\xff"),
      with_size(std::string_view("\x80\0\0\0", 4)),
      frame_bytes(wire::FrameKind::call, 1, "noSuchOperation:"),
      frame_bytes(wire::FrameKind::call, 1, "copyRegulatoryImagesWithCompletionBlock:", array({1, "shape"})),
      frame_bytes(wire::FrameKind::state, 1, "", dictionary({})),
      call.substr(0, 3),
      "",
      call,
  };
}

}  // namespace

HostileClients::~HostileClients() {
  stopping_ = true;
  for (std::thread& thread : threads_) thread.join();
}

SocketPeer& HostileClients::hold() { return held_.emplace_back(connected()); }

void HostileClients::add_idle(std::size_t count) {
  while (count-- > 0) hold();
}

void HostileClients::add_half_calls(std::size_t count) {
  const std::string call = image_call(1);
  for (std::size_t i = 0; i < count; ++i) hold().send(call.substr(0, 1 + i % (call.size() - 1)));
}

void HostileClients::add_never_reading(std::size_t count) {
  for (std::size_t i = 0; i < count; ++i) {
    SocketPeer& peer = hold();
    peer.send(image_call(i));
    never_reading_.push_back(peer.descriptor());
  }
}

std::size_t HostileClients::wait_for_replies() {
  return static_cast<std::size_t>(std::count_if(never_reading_.begin(), never_reading_.end(), [](int descriptor) {
    pollfd begun = {descriptor, POLLIN, 0};
    return ::poll(&begun, 1, static_cast<int>(kPatience.count())) == 1 && (begun.revents & POLLHUP) == 0;
  }));
}

void HostileClients::trickle() {
  char byte;
  for (const int descriptor : never_reading_) static_cast<void>(::recv(descriptor, &byte, 1, MSG_DONTWAIT));
}

void HostileClients::add_flooding() { threads_.emplace_back(&HostileClients::flood, this); }
void HostileClients::add_reconnecting() { threads_.emplace_back(&HostileClients::reconnect, this); }

void HostileClients::flood() {
  constexpr int kCallsAtOnce = 256;
  const SocketPeer peer = connected();
  std::string calls;
  for (int i = 0; i < kCallsAtOnce; ++i) calls += image_call(1);
  std::string replies(1u << 20, '\0');
  std::size_t sent = 0;
  while (!stopping_) {
    pollfd wanted = {peer.descriptor(), POLLIN | POLLOUT, 0};
    if (::poll(&wanted, 1, 100) != 1) continue;
    if ((wanted.revents & POLLIN) != 0 && ::recv(peer.descriptor(), replies.data(), replies.size(), MSG_DONTWAIT) > 0)
      ++flood_replies_;
    if ((wanted.revents & POLLOUT) == 0) continue;
    const ssize_t count =
        ::send(peer.descriptor(), calls.data() + sent, calls.size() - sent, MSG_DONTWAIT | MSG_NOSIGNAL);
    if (count > 0) sent = (sent + static_cast<std::size_t>(count)) % calls.size();
  }
}

void HostileClients::reconnect() {
  const std::vector<std::string> messages = rubbish();
  for (std::size_t i = 0; !stopping_; ++i) {
    SocketPeer peer = connected_now();
    if (!peer) continue;
    const std::string& message = messages[i % messages.size()];
    if (i % 2 == 0 && !message.empty())
      send_attached(peer.descriptor(), message, std::vector<int>(16, STDIN_FILENO));
    else
      peer.send(message);
    ++reconnections_;
  }
}

}  // namespace quorvel::test
