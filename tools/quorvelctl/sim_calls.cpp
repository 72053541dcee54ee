#include "sim_calls.h"

#include "client_failure.h"
#include "output.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

using namespace std::chrono_literals;

constexpr auto kPatience = 5s;
// An observer that does not read is cut off after five seconds, so a thousand events never take longer than this.
constexpr auto kPatienceForAThousand = 10s;

PropertyValue ask(std::string_view command, const PropertyValue& argument, std::chrono::milliseconds patience) {
  client::Options options;
  options.service = "telvane";
  options.timeout = patience;
  const client::Reply reply = client::Client(options).call(command, argument);
  if (!reply.error) return reply.value;
  if (reply.error->code == client::ErrorCode::service_failure) {
    throw Failure{kWrongWords, "the telephony service refuses: " + reply.error->description};
  }
  throw unreachable(*reply.error, "the simulator", "telvane-sim");
}

using Entries = std::initializer_list<std::pair<std::string_view, PropertyValue>>;

PropertyValue dictionary_of(Entries entries) {
  PropertyValue dictionary = PropertyValue::dictionary(entries.size());
  for (const auto& [key, value] : entries) {
    if (value) put(dictionary, key, value);
  }
  return dictionary;
}

void tell(std::string_view command, Entries entries) {
  static_cast<void>(ask(command, dictionary_of(entries), kPatience));
}

}  // namespace

PropertyValue simulator_state() { return ask(wire::kShowCommand, {}, kPatience); }

void set_field(std::string_view field, const PropertyValue& value) {
  tell(wire::kSetCommand,
       {{wire::kCommandFieldKey.text(), PropertyValue::string(field)}, {wire::kStateValueKey.text(), value}});
}

void set_error(std::string_view field, std::int32_t domain, std::int32_t code) {
  tell(wire::kFailCommand, {{wire::kCommandFieldKey.text(), PropertyValue::string(field)},
                            {wire::kStateDomainKey.text(), PropertyValue::integer(domain)},
                            {wire::kStateCodeKey.text(), PropertyValue::integer(code)}});
}

void clear_error(std::string_view field) {
  tell(wire::kSucceedCommand, {{wire::kCommandFieldKey.text(), PropertyValue::string(field)}});
}

std::uint64_t notify_observers(const std::string& name, std::uint32_t count) {
  const PropertyValue reply = ask(wire::kNotifyCommand,
                                  dictionary_of({{wire::kCommandNameKey.text(), PropertyValue::string(name)},
                                                 {wire::kCommandCountKey.text(), PropertyValue::integer(count)}}),
                                  kPatienceForAThousand * (1 + count / 1000));
  const std::uint64_t observers = reply.get(wire::kReplyObserversKey.text()).to_uint64().value_or(0);
  const std::uint64_t cut_off = reply.get(wire::kReplyCutOffKey.text()).to_uint64().value_or(0);
  if (cut_off > 0) {
    throw Failure{kUnreachable,
                  "an observer did not read for five seconds and was cut off: not everything that was "
                  "sent has arrived. See what the daemon does with: quorvelctl status"};
  }
  if (observers == 0) note("nobody observes, so " + name + " reached nobody. See: quorvelctl status");
  return observers;
}

}  // namespace quorvel::tools
