#include "log/daemon_log.h"

#include <cerrno>

#include "log/client_lines.h"
#include "log/line_head.h"
#include "log/log_writer.h"
#include "log/message.h"

namespace quorvel {

namespace {

constexpr std::size_t kLineSize = 2048;  // terminator included
constexpr std::string_view kFallback = "error: the message string could not be created";

// Writes the whole line into `line`. Returns what stands behind its head. The message goes straight to its place: what
// exceeds the message buffer would be cut with the line anyway.
std::string_view compose(char (&line)[kLineSize], const char* function, const char* format,
                         std::span<const LogArgument> arguments) noexcept {
  TextSink sink(std::span(line, kLineSize - 1));
  sink.put(line_head());
  const char* const behind_head = sink.position();
  sink.put_escaped(function == nullptr ? std::string_view{} : std::string_view(function));
  sink.put(": ");
  const TextSink message_start = sink;
  if (!format_message(format, arguments, sink)) {
    sink = message_start;
    sink.put(kFallback);
  }
  sink.put('\n');
  *sink.position() = '\0';
  return {behind_head, static_cast<std::size_t>(sink.position() - behind_head)};
}

void tell(const LeftOutLines& left_out) noexcept {
  char line[kLineSize];
  const LogArgument arguments[] = {left_out.count, left_out.user, left_out.process};
  compose(line, "daemon_log",
          "left out %lu lines that said the same again, the last of them for a call of user %u, process %d", arguments);
  log_write_line(line);
}

}  // namespace

void daemon_log_arguments(int /*level*/, const char* function, const char* format,
                          std::span<const LogArgument> arguments) noexcept {
  const int error = errno;
  char line[kLineSize];
  if (!leave_line_out(compose(line, function, format, arguments))) {
    if (const LeftOutLines left_out = take_left_out_lines(); left_out.count > 0) tell(left_out);
    log_write_line(line);
  }
  errno = error;
}

}  // namespace quorvel
