#include "client/core/failure.h"

#include <cstring>

#include "property/description.h"

namespace quorvel::client {
namespace {

TextSink begin_sentence(Failure& failure, ErrorCode code, std::initializer_list<std::string_view> parts) noexcept {
  failure.code = code;
  failure.service_code = 0;
  TextSink sentence(std::span(failure.sentence, sizeof failure.sentence - 1));
  for (const std::string_view part : parts) sentence.put_escaped(part);
  return sentence;
}

}  // namespace

void set_failure(Failure& failure, ErrorCode code, std::initializer_list<std::string_view> parts) noexcept {
  *begin_sentence(failure, code, parts).position() = '\0';
}

void set_system_failure(Failure& failure, ErrorCode code, std::initializer_list<std::string_view> parts,
                        int error) noexcept {
  TextSink sentence = begin_sentence(failure, code, parts);
  sentence.put(": ");
  sentence.put(std::strerror(error));
  *sentence.position() = '\0';
}

}  // namespace quorvel::client
