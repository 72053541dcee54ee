#include "linux/telephony/telephony_stream.h"

#include <sys/socket.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>

#include "linux/base/local_socket.h"
#include "wire/service_path.h"
#include "wire/telephony_state.h"

namespace quorvel::platform::host {

namespace {

constexpr std::size_t kReceiveSize = 64u << 10;

[[nodiscard]] bool is_owned_by_peer(int directory, int socket) noexcept {
  struct stat status;
  ucred peer;
  socklen_t length = sizeof peer;
  return ::fstat(directory, &status) == 0 && ::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &peer, &length) == 0 &&
         peer.uid == status.st_uid;
}

}  // namespace

bool TelephonyStream::connect() noexcept {
  const Descriptor directory = open_service_directory();
  if (!directory) return false;
  Descriptor socket = connect_local(wire::kTelephonySocket);
  if (!socket || !is_owned_by_peer(directory.get(), socket.get())) return false;
  close();
  socket_ = std::move(socket);
  return true;
}

void TelephonyStream::close() noexcept {
  socket_ = Descriptor();
  input_ = ByteBuffer();
  taken_ = 0;
}

TelephonyStream::Result TelephonyStream::next(wire::Frame& frame) noexcept {
  const Result buffered = take_frame(frame);
  if (buffered != Result::nothing) return buffered;
  drop_taken();
  const Result received = receive();
  return received == Result::frame ? take_frame(frame) : received;
}

TelephonyStream::Result TelephonyStream::take_frame(wire::Frame& frame) noexcept {
  switch (wire::parse_frame(input_.bytes().subspan(taken_), wire::kMaximumStateBody, frame)) {
    case wire::FrameResult::complete: taken_ += wire::kFrameHeadSize + frame.head.body_length; return Result::frame;
    case wire::FrameResult::incomplete: return Result::nothing;
    case wire::FrameResult::refused: break;
  }
  return Result::gone;
}

// Room for one large frame is not kept for the small ones that usually follow.
void TelephonyStream::drop_taken() noexcept {
  input_.consume(taken_);
  taken_ = 0;
  if (input_.empty()) input_.clear(2 * kReceiveSize);
}

// `frame` here says that bytes came. The room follows what has arrived, never what a head announces.
TelephonyStream::Result TelephonyStream::receive() noexcept {
  const std::size_t size = input_.size();
  const std::size_t needed = size + kReceiveSize;
  if (!input_.reserve(needed <= input_.capacity() ? needed : std::max(needed, 2 * size))) return Result::gone;
  static_cast<void>(input_.resize(needed));
  const ssize_t count = ::recv(descriptor(), input_.data() + size, kReceiveSize, MSG_DONTWAIT);
  const int error = errno;
  static_cast<void>(input_.resize(size + static_cast<std::size_t>(std::max<ssize_t>(count, 0))));
  if (count > 0) return Result::frame;
  return count < 0 && (error == EAGAIN || error == EINTR) ? Result::nothing : Result::gone;
}

}  // namespace quorvel::platform::host
