// What the simulated telephony service answers, and the frames that tell of it.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>

#include "property/byte_buffer.h"
#include "property/value.h"

namespace quorvel::tools {

/// Bytes that several connections send.
using SharedFrame = std::shared_ptr<const ByteBuffer>;

class SimState {
 public:
  SimState();

  [[nodiscard]] const PropertyValue& value() const noexcept { return state_; }

  /// Carries out one of the commands set, fail and succeed. Returns why it is refused, and nothing has changed then, or
  /// an empty text.
  [[nodiscard]] std::string change(std::string_view command, const PropertyValue& argument);

  /// The state for somebody who connects, and with a notification. Null when memory runs out.
  [[nodiscard]] SharedFrame state_frame();
  [[nodiscard]] SharedFrame event_frame(const std::string& notification);

 private:
  [[nodiscard]] SharedFrame frame_of(const PropertyValue& state, const std::string& notification) const;

  PropertyValue state_;
  std::map<std::string, SharedFrame> frames_;  // by notification, empty for the state alone; until the state changes
};

}  // namespace quorvel::tools
