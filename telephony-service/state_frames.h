// The state that a telephony service tells, and the frames that carry it: each encoded once, however many observe.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>

#include "property/byte_buffer.h"
#include "property/value.h"

namespace quorvel::telephony {

/// Bytes that several connections send.
using SharedFrame = std::shared_ptr<const ByteBuffer>;

class StateFrames {
 public:
  StateFrames() : state_(PropertyValue::dictionary()) {}

  [[nodiscard]] const PropertyValue& value() const noexcept { return state_; }

  /// Replaces the state. False, and nothing has changed, when it is too large or too deep to be sent.
  [[nodiscard]] bool replace(const PropertyValue& state);

  /// The frame with the state alone, and with a notification. Null when memory runs out.
  [[nodiscard]] SharedFrame state_frame() { return event_frame({}); }
  [[nodiscard]] SharedFrame event_frame(const std::string& notification);

 private:
  PropertyValue state_;
  std::map<std::string, SharedFrame> frames_;  // by notification, empty for the state alone; until the state changes
};

}  // namespace quorvel::telephony
