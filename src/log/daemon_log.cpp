#include "log/daemon_log.h"

#include <cerrno>

#include "log/line_head.h"
#include "log/log_writer.h"
#include "log/message.h"

namespace quorvel {

namespace {

constexpr std::size_t kLineSize = 2048;  // terminator included
constexpr std::string_view kFallback = "error: the message string could not be created";

}  // namespace

// The message goes straight to its place in the line: what exceeds the message buffer would be cut with the line
// anyway.
void daemon_log_arguments(int /*level*/, const char* function, const char* format,
                          std::span<const LogArgument> arguments) noexcept {
  const int error = errno;
  char line[kLineSize];
  TextSink sink(std::span(line, kLineSize - 1));
  sink.put(line_head());
  sink.put_escaped(function == nullptr ? std::string_view{} : std::string_view(function));
  sink.put(": ");
  const TextSink message_start = sink;
  if (!format_message(format, arguments, sink)) {
    sink = message_start;
    sink.put(kFallback);
  }
  sink.put('\n');
  *sink.position() = '\0';
  log_write_line(line);
  errno = error;
}

}  // namespace quorvel
