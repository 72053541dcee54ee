#include "linux/telephony/telephony_stream.h"

#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string_view>

#include "linux/base/error_line.h"
#include "linux/base/local_socket.h"
#include "linux/telephony/telephony_trouble.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "wire/service_path.h"
#include "wire/telephony_state.h"

namespace quorvel::platform::host {

namespace {

constexpr std::size_t kReceiveSize = 64u << 10;

// How long a failure to connect lasts: until something changes in the service directory, or perhaps not so long.
[[nodiscard]] TelephonyStream::Connection outcome_of(int error) noexcept {
  using Connection = TelephonyStream::Connection;
  if (error == ENOENT) return Connection::absent;
  const bool lasts = error == EACCES || error == EPERM || error == EPROTOTYPE || error == ELOOP;
  return lasts ? Connection::barred : Connection::busy;
}

void tell_unreachable(int error) noexcept {
  if (!should_tell(TelephonyTrouble::connection, error)) return;
  errno = error;
  print_system_error("cannot connect to the telephony service on %s as user %u", paths::kTelephonySocket, ::geteuid());
}

}  // namespace

bool TelephonyStream::has_place() noexcept {
  return static_cast<bool>(Descriptor(open_file(paths::kTelephonySocket, O_PATH | O_NOFOLLOW, 0)));
}

bool TelephonyStream::is_trusted(int directory, int socket) noexcept {
  struct stat status;
  ucred peer;
  socklen_t length = sizeof peer;
  if (::fstat(directory, &status) != 0 || ::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &peer, &length) != 0) {
    return false;
  }
  process_ = peer.pid;
  user_ = peer.uid;
  if (peer.uid == 0 || peer.uid == status.st_uid) return true;
  if (should_tell(TelephonyTrouble::trust, static_cast<int>(peer.uid))) {
    print_error_line("%s is served by process %d of user %u; only root and user %u, who owns %s, are believed",
                     paths::kTelephonySocket, peer.pid, peer.uid, status.st_uid, wire::kServiceDirectory.data());
  }
  return false;
}

TelephonyStream::Connection TelephonyStream::connect() noexcept {
  const Descriptor directory = open_service_directory();
  Descriptor socket = directory ? connect_local(wire::kTelephonySocket) : Descriptor();
  if (!socket) {
    const int error = errno;
    tell_unreachable(error);
    return outcome_of(error);
  }
  if (!is_trusted(directory.get(), socket.get())) return Connection::barred;
  close();
  socket_ = std::move(socket);
  return Connection::open;
}

void TelephonyStream::tell_unusable(const wire::Frame& frame) const noexcept {
  const auto kind = static_cast<unsigned>(frame.head.kind);
  const bool is_foreign = frame.head.kind != wire::FrameKind::state && frame.head.kind != wire::FrameKind::event;
  if (!should_tell(TelephonyTrouble::state, is_foreign ? 1 : frame.payload.empty() ? 2 : 3)) return;
  const char* fault = is_foreign ? "neither a state nor an event"
                      : frame.payload.empty()
                          ? "no state"
                          : "a state that is no readable property list with a dictionary at its root";
  print_error_line("the telephony service on %s (process %d, user %u) sent %s: frame of kind %u, %zu bytes",
                   paths::kTelephonySocket, process_, user_, fault, kind, frame.payload.size());
}

void TelephonyStream::close() noexcept {
  socket_ = Descriptor();
  input_.clear();
}

TelephonyStream::Result TelephonyStream::next(wire::Frame& frame) noexcept {
  const Result buffered = take_frame(frame);
  if (buffered != Result::nothing) return buffered;
  return receive() ? take_frame(frame) : Result::gone;
}

TelephonyStream::Result TelephonyStream::take_frame(wire::Frame& frame) noexcept {
  switch (input_.next(wire::kMaximumStateBody, frame)) {
    case wire::FrameResult::complete: return Result::frame;
    case wire::FrameResult::incomplete: return Result::nothing;
    case wire::FrameResult::refused: break;
  }
  if (should_tell(TelephonyTrouble::frame, frame.head.kind > wire::FrameKind::event ? 1 : 0)) {
    print_error_line(
        "the telephony service on %s (process %d, user %u) sent no frame: kind %u, flags %u, name of %u bytes, body of "
        "%u bytes (at most %u)",
        paths::kTelephonySocket, process_, user_, static_cast<unsigned>(frame.head.kind), unsigned{frame.head.flags},
        unsigned{frame.head.name_length}, frame.head.body_length, wire::kMaximumStateBody);
  }
  return Result::gone;
}

// False when the service has left. Room for one large frame is not kept for the small ones that usually follow.
bool TelephonyStream::receive() noexcept {
  const std::span<std::byte> room = input_.room(kReceiveSize, 2 * kReceiveSize);
  if (room.empty()) return false;
  const ssize_t count = ::recv(descriptor(), room.data(), room.size(), MSG_DONTWAIT);
  const int error = errno;
  if (count > 0) input_.arrived(static_cast<std::size_t>(count));
  if (count > 0 || (count < 0 && (error == EAGAIN || error == EINTR))) return true;
  if (should_tell(TelephonyTrouble::loss, count == 0 ? 0 : error)) {
    print_error_line("the telephony service on %s (process %d, user %u) left%s%s", paths::kTelephonySocket, process_,
                     user_, count == 0 ? "" : ": ", count == 0 ? "" : ::strerrordesc_np(error));
  }
  return false;
}

}  // namespace quorvel::platform::host
