// The C interface: values of every kind, a service that misbehaves, an observer, and every allocation that fails.
#include <poll.h>

#include <cmath>
#include <cstring>

#include "device/baseband_info.h"
#include "hardening/allocations.h"
#include "quorvel.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::test {
namespace {

using Kind = wire::FrameKind;
using Value = std::unique_ptr<quorvel_value, decltype(&quorvel_value_free)>;
using Client = std::unique_ptr<quorvel_client, decltype(&quorvel_client_free)>;
using Call = std::unique_ptr<quorvel_call, decltype(&quorvel_call_free)>;
using Observer = std::unique_ptr<quorvel_observer, decltype(&quorvel_observer_free)>;

constexpr const char* kService = "com.Orvane.quorveld.sock";

Value own(quorvel_value* value) { return {value, quorvel_value_free}; }
Client new_client(std::int64_t time_limit = 20'000) {
  Client client(quorvel_client_new(), quorvel_client_free);
  quorvel_client_set_time_limit(client.get(), time_limit);
  return client;
}

std::string described(const quorvel_value* value) {
  char text[4096];
  const std::size_t length = quorvel_value_describe(value, text, sizeof text);
  EXPECT_EQ(std::strlen(text), length);
  return text;
}

// One of each kind, within each other; null when memory runs out on the way.
quorvel_value* everything() {
  const std::string long_text(1000, 'x');
  quorvel_value* list = quorvel_array_new();
  bool made = true;
  for (quorvel_value* item :
       {quorvel_boolean_new(true), quorvel_integer_new(INT64_MIN), quorvel_unsigned_new(UINT64_MAX),
        quorvel_real_new(-0.0), quorvel_date_new(1.5), quorvel_string_new("Zo\xc3\xab"),
        quorvel_string_new_with_length("a\0b", 3), quorvel_string_new(long_text.c_str()), quorvel_data_new("\0\xff", 2),
        quorvel_data_new(nullptr, 0), quorvel_array_new(), quorvel_dictionary_new()}) {
    if (quorvel_array_append(&list, item) != QUORVEL_OK) made = false;
  }
  quorvel_value* dictionary = quorvel_dictionary_new();
  for (int i = 0; i < 40 && made; ++i) {
    const std::string key = "key " + std::to_string(i);
    made = quorvel_dictionary_set(&dictionary, key.c_str(), quorvel_value_copy(list)) == QUORVEL_OK;
  }
  quorvel_value_free(list);
  if (made && dictionary != nullptr) return dictionary;
  quorvel_value_free(dictionary);
  return nullptr;
}

TEST(CValues, OfEveryKindSurviveTheirEncoding) {
  const Value value = own(everything());
  const Value encoding = own(quorvel_value_encode(value.get()));
  std::size_t length = 0;
  const void* bytes = quorvel_data_get(encoding.get(), &length);
  const Value again = own(quorvel_value_decode(bytes, length));
  EXPECT_TRUE(quorvel_value_equal(value.get(), again.get()));
  for (std::size_t cut = 0; cut < length; cut += 7) EXPECT_EQ(quorvel_value_decode(bytes, cut), nullptr) << cut;
  EXPECT_EQ(quorvel_value_decode(nullptr, 5), nullptr);
  EXPECT_EQ(quorvel_value_encode(nullptr), nullptr);

  const quorvel_value* list = quorvel_dictionary_get(again.get(), "key 7");
  ASSERT_EQ(quorvel_value_count(list), 12u);
  const quorvel_kind kinds[] = {QUORVEL_BOOLEAN, QUORVEL_INTEGER, QUORVEL_INTEGER, QUORVEL_REAL,
                                QUORVEL_DATE,    QUORVEL_STRING,  QUORVEL_STRING,  QUORVEL_STRING,
                                QUORVEL_DATA,    QUORVEL_DATA,    QUORVEL_ARRAY,   QUORVEL_DICTIONARY};
  for (std::size_t i = 0; i < std::size(kinds); ++i) {
    EXPECT_EQ(quorvel_value_kind(quorvel_array_get(list, i)), kinds[i]) << i;
  }
  bool boolean = false;
  std::int64_t integer = 5;
  std::uint64_t natural = 5;
  double real = 5;
  EXPECT_TRUE(quorvel_boolean_get(quorvel_array_get(list, 0), &boolean) && boolean);
  EXPECT_TRUE(quorvel_integer_get(quorvel_array_get(list, 1), &integer) && integer == INT64_MIN);
  EXPECT_FALSE(quorvel_unsigned_get(quorvel_array_get(list, 1), &natural));
  EXPECT_TRUE(quorvel_unsigned_get(quorvel_array_get(list, 2), &natural) && natural == UINT64_MAX);
  EXPECT_FALSE(quorvel_integer_get(quorvel_array_get(list, 2), &integer));
  EXPECT_FALSE(quorvel_date_get(quorvel_array_get(list, 3), &real));
  EXPECT_TRUE(quorvel_real_get(quorvel_array_get(list, 3), &real) && real == 0 && std::signbit(real));
  EXPECT_TRUE(quorvel_date_get(quorvel_array_get(list, 4), &real) && real == 1.5);
  const char* string = quorvel_string_get(quorvel_array_get(list, 6), &length);
  EXPECT_EQ(std::string_view(string, length), std::string_view("a\0b", 3));
  char text[4];
  EXPECT_EQ(quorvel_string_copy(quorvel_array_get(list, 5), text, sizeof text), 4u);
  EXPECT_STREQ(text, "Zo");  // not half of its last letter
  EXPECT_EQ(quorvel_array_get(list, 12), nullptr);
}

TEST(CValues, ChangeOnlyThroughTheirOwnHandle) {
  quorvel_value* first = quorvel_dictionary_new();
  EXPECT_EQ(quorvel_dictionary_set(&first, "a", quorvel_integer_new(1)), QUORVEL_OK);
  EXPECT_EQ(quorvel_dictionary_set(&first, "self", quorvel_value_copy(first)), QUORVEL_OK);
  quorvel_value* second = quorvel_value_copy(first);
  EXPECT_EQ(quorvel_dictionary_set(&second, "a", quorvel_integer_new(2)), QUORVEL_OK);
  EXPECT_EQ(quorvel_dictionary_remove(&first, "nothing"), QUORVEL_OK);
  EXPECT_EQ(quorvel_dictionary_remove(&first, "a"), QUORVEL_OK);
  EXPECT_EQ(described(first), "{\"self\": {\"a\": 1}}");
  EXPECT_EQ(described(second), "{\"a\": 2, \"self\": {\"a\": 1}}");

  // A decoded value accepts changes like any other.
  const Value encoding = own(quorvel_value_encode(second));
  std::size_t length = 0;
  const void* bytes = quorvel_data_get(encoding.get(), &length);
  quorvel_value* decoded = quorvel_value_decode(bytes, length);
  EXPECT_EQ(quorvel_dictionary_set(&decoded, "b", quorvel_boolean_new(false)), QUORVEL_OK);
  std::string walk;
  std::size_t position = 0;
  for (const quorvel_value *key, *value; quorvel_dictionary_next(decoded, &position, &key, &value);) {
    walk += described(key) + "=" + described(value) + ";";
  }
  EXPECT_EQ(walk, "a=2;self={\"a\": 1};b=false;");

  EXPECT_EQ(quorvel_dictionary_set(&first, "\xff", quorvel_integer_new(1)), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(quorvel_dictionary_set(&first, "k", nullptr), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(quorvel_array_append(&first, quorvel_string_new("text")), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(quorvel_array_append(nullptr, quorvel_string_new("text")), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(quorvel_string_new("\xff"), nullptr);
  for (quorvel_value* value : {first, second, decoded}) quorvel_value_free(value);
}

// Polls as an event loop does: one step each time the descriptor is readable.
int step_to_the_end(const Call& call, quorvel_value** reply, quorvel_error* error) {
  for (;;) {
    pollfd ready{quorvel_call_descriptor(call.get()), POLLIN, 0};
    if (::poll(&ready, 1, 30'000) != 1) return -1;
    const int code = quorvel_call_step(call.get(), reply, error);
    if (code != QUORVEL_NOT_YET) return code;
  }
}

TEST(CClient, TellsHowAServiceMisbehavesWaitingOrNot) {
  ScratchRoot root;
  const std::string reply = frame_bytes(Kind::reply, 1, "", text("answer"));
  std::vector<std::string> trickle;
  for (const char byte : frame_bytes(Kind::state, 0, "", dictionary({})) + reply) trickle.emplace_back(1, byte);
  const std::string busy =
      frame_bytes(Kind::failure, 1, "", dictionary({{"Code", 7}, {"Description", std::string(600, 'b') + "\n"}}));
  struct Case {
    const char* what;
    std::vector<std::string> pieces;
    bool hold;
    int code;
  };
  const Case cases[] = {
      {"a byte at a time, other frames first", trickle, true, QUORVEL_OK},
      {"answers with no value", {frame_bytes(Kind::reply, 1, "")}, true, QUORVEL_OK},
      {"closes at once", {}, false, QUORVEL_DISCONNECTED},
      {"closes within the reply", {reply.substr(0, reply.size() - 1)}, false, QUORVEL_DISCONNECTED},
      {"says nothing", {}, true, QUORVEL_TIMED_OUT},
      {"stops within the reply", {reply.substr(0, 20)}, true, QUORVEL_TIMED_OUT},
      {"talks without end", std::vector(400, frame_bytes(Kind::reply, 2, "", text("x"))), true, QUORVEL_TIMED_OUT},
      {"sends rubbish", {std::string(64, '\xff')}, true, QUORVEL_PROTOCOL_ERROR},
      {"announces too much", {std::string("\x7f\0\0\0\2\0\0\0\0\0\0\0\0\0\0\1", 16)}, true, QUORVEL_PROTOCOL_ERROR},
      {"replies with no list", {std::string("\0\0\0\1\2\0\0\0\0\0\0\0\0\0\0\1n", 17)}, true, QUORVEL_PROTOCOL_ERROR},
      {"fails", {busy}, true, QUORVEL_SERVICE_FAILURE},
      {"fails oddly", {frame_bytes(Kind::failure, 1, "", text("x"))}, true, QUORVEL_SERVICE_FAILURE},
  };
  static_cast<void>(listen_on(kService));  // the root itself stays open from here on
  root.remove(std::string("/run/quorvel/") + kService);
  const std::size_t before = descriptors_open();
  for (const Case& test : cases) {
    {
      const FakeService service(kService, test.pieces, test.hold, 2);
      const Client client = new_client(test.code == QUORVEL_TIMED_OUT ? 100 : 20'000);
      for (const bool waiting : {true, false}) {
        quorvel_error error{};
        quorvel_value* answer = nullptr;
        int code = -1;
        if (waiting) {
          code = quorvel_client_copy_regulatory_images(client.get(), &answer, &error);
        } else {
          const Call call(quorvel_call_start(client.get(), "operation", nullptr, &error), quorvel_call_free);
          ASSERT_NE(call, nullptr) << error.sentence;
          code = step_to_the_end(call, &answer, &error);
          quorvel_value* more = answer;
          EXPECT_EQ(quorvel_call_step(call.get(), &more, nullptr), QUORVEL_INVALID_ARGUMENT);
        }
        EXPECT_EQ(code, test.code) << test.what << ": " << error.sentence;
        EXPECT_EQ(error.code, test.code) << test.what;
        EXPECT_EQ(answer != nullptr, test.code == QUORVEL_OK && test.pieces.size() > 1) << test.what;
        EXPECT_EQ(std::strlen(error.sentence) > 0, test.code != QUORVEL_OK) << test.what;
        EXPECT_EQ(error.service_code, test.pieces == std::vector{busy} ? 7 : 0) << test.what;
        quorvel_value_free(answer);
      }
    }
    root.remove(std::string("/run/quorvel/") + kService);
  }
  EXPECT_EQ(descriptors_open(), before);
}

TEST(CClient, TellsWhyACallCannotBegin) {
  ScratchRoot root;
  quorvel_value* reply = nullptr;
  quorvel_error error;
  const auto code_of = [&](const char* given_root, const char* service, const char* operation) {
    const Client client = new_client();
    EXPECT_EQ(quorvel_client_set_root(client.get(), given_root), QUORVEL_OK);
    EXPECT_EQ(quorvel_client_set_service(client.get(), service), QUORVEL_OK);
    return quorvel_client_call(client.get(), operation, nullptr, &reply, &error);
  };
  EXPECT_EQ(code_of(nullptr, nullptr, "operation"), QUORVEL_SERVICE_ABSENT);
  EXPECT_NE(std::strstr(error.sentence, "/run/quorvel/com.Orvane.quorveld.sock"), nullptr) << error.sentence;
  EXPECT_EQ(code_of("relative", nullptr, "operation"), QUORVEL_INVALID_ROOT);
  EXPECT_EQ(code_of(nullptr, "../telvane", "operation"), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(code_of(nullptr, std::string(500, 'x').c_str(), "operation"), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(code_of(nullptr, nullptr, "\n"), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(code_of(nullptr, nullptr, nullptr), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(quorvel_client_call(nullptr, "operation", nullptr, &reply, nullptr), QUORVEL_INVALID_ARGUMENT);
  EXPECT_EQ(quorvel_call_start(nullptr, "operation", nullptr, nullptr), nullptr);
  EXPECT_EQ(quorvel_observer_start(nullptr, nullptr), nullptr);
}

TEST(CObserver, HearsOfNotificationsAndWhatItMissed) {
  ScratchRoot root;
  EXPECT_EQ(std::string_view(QUORVEL_PHONE_NUMBER_CHANGED), kPhoneNumberChangedNotification.text());
  const std::string changed = QUORVEL_PHONE_NUMBER_CHANGED;
  // All at once: the descriptor has to stay readable for a caller who takes one step each time.
  const FakeService service(
      "notifications.sock",
      {frame_bytes(Kind::ready, 41, "") + frame_bytes(Kind::notification, 42, changed, text(changed)) +
       frame_bytes(Kind::missed, 50, "", PropertyValue::integer(8)) + frame_bytes(Kind::notification, 51, "plain") +
       frame_bytes(Kind::state, 1, "")},
      true, 2);
  const Client client = new_client();
  for (const bool waiting : {true, false}) {
    const Observer observer(quorvel_observer_start(client.get(), nullptr), quorvel_observer_free);
    std::string heard;
    quorvel_event event{};
    quorvel_error error{};
    int code = QUORVEL_OK;
    while (code == QUORVEL_OK || code == QUORVEL_NOT_YET) {
      pollfd ready{quorvel_observer_descriptor(observer.get()), POLLIN, 0};
      ASSERT_TRUE(waiting || ::poll(&ready, 1, 30'000) == 1);
      code = waiting ? quorvel_observer_wait(observer.get(), 20'000, &event, &error)
                     : quorvel_observer_step(observer.get(), &event, &error);
      if (code != QUORVEL_OK) continue;
      heard += std::to_string(event.kind) + " #" + std::to_string(event.sequence) + " " + std::to_string(event.missed) +
               " " + event.name + " " + described(event.object) + "\n";
    }
    EXPECT_EQ(heard,
              "1 #41 0  (null)\n2 #42 0 " + changed + " " + changed + "\n3 #50 8  (null)\n2 #51 0 plain (null)\n");
    EXPECT_EQ(code, QUORVEL_PROTOCOL_ERROR) << error.sentence;
    EXPECT_EQ(quorvel_observer_step(observer.get(), &event, nullptr), QUORVEL_INVALID_ARGUMENT);
  }
}

TEST(COutOfMemory, IsAnErrorLikeAnyOther) {
  ScratchRoot root;
  const Value expected = own(everything());
  const Value encoding = own(quorvel_value_encode(expected.get()));
  std::size_t length = 0;
  const void* bytes = quorvel_data_get(encoding.get(), &length);
  const Client client = new_client();
  quorvel_error error{};
  // Each operation with its first allocation failing, its second, and so on, until it needs no more.
  const auto sweep = [&](const char* what, const auto& operation) {
    long number = 0;
    for (bool done = false; !done; ++number) {
      allocations::fail(allocations::Fault::once, number);
      const bool succeeded = operation();
      done = allocations::stop_failing() == 0;
      EXPECT_EQ(succeeded, done) << what << ", allocation " << number;
    }
    EXPECT_GT(number, 1) << what;
  };
  sweep("decode", [&] { return own(quorvel_value_decode(bytes, length)) != nullptr; });
  sweep("encode", [&] { return own(quorvel_value_encode(expected.get())) != nullptr; });
  sweep("append", [&] {
    quorvel_value* list = quorvel_array_new();
    const int code = quorvel_array_append(&list, quorvel_string_new("text"));
    quorvel_value_free(list);
    return code == QUORVEL_OK;
  });
  sweep("change a copy", [&] {
    quorvel_value* copy = quorvel_value_copy(expected.get());
    const int code = quorvel_dictionary_set(&copy, "new", quorvel_boolean_new(true));
    EXPECT_EQ(code == QUORVEL_OK, !quorvel_value_equal(copy, expected.get()));
    quorvel_value_free(copy);
    return code == QUORVEL_OK;
  });
  sweep("set the root", [&] { return quorvel_client_set_root(client.get(), root.path().c_str()) == QUORVEL_OK; });
  static_cast<void>(listen_on(kService));
  sweep("start a call", [&] {
    return Call(quorvel_call_start(client.get(), "operation", expected.get(), &error), quorvel_call_free) != nullptr;
  });
}

}  // namespace
}  // namespace quorvel::test
