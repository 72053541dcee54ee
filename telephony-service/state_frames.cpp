#include "telephony-service/state_frames.h"

#include "wire/frame.h"
#include "wire/telephony_state.h"

namespace quorvel::telephony {
namespace {

SharedFrame frame_of(const PropertyValue& state, const std::string& notification) {
  const wire::FrameKind kind = notification.empty() ? wire::FrameKind::state : wire::FrameKind::event;
  auto frame = std::make_shared<ByteBuffer>();
  if (!wire::append_frame(kind, 0, 0, notification, state, *frame)) return nullptr;
  constexpr std::size_t kLimit = wire::kMaximumStateBody - wire::kMaximumNameLength;
  return frame->size() <= kLimit ? frame : nullptr;
}

}  // namespace

bool StateFrames::replace(const PropertyValue& state) {
  SharedFrame frame = frame_of(state, {});
  if (!frame) return false;
  state_ = state;
  frames_.clear();
  frames_.emplace(std::string(), std::move(frame));
  return true;
}

SharedFrame StateFrames::event_frame(const std::string& notification) {
  SharedFrame& frame = frames_[notification];
  if (!frame) frame = frame_of(state_, notification);
  return frame;
}

}  // namespace quorvel::telephony
