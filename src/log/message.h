// The text of a log message, made from its format and arguments.
#pragma once

#include <span>

#include "log/daemon_log.h"
#include "property/description.h"

namespace quorvel {

/// Adds the formatted message to `sink`. False, with part of it added, when the format is null or does not fit its
/// arguments. Any thread.
[[nodiscard]] bool format_message(const char* format, std::span<const LogArgument> arguments, TextSink& sink) noexcept;

}  // namespace quorvel
