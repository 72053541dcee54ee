// Values that hold no other values: made, read, copied, compared, described.
#include <cstring>

#include "handles.h"
#include "property/description.h"

using quorvel::PropertyKind;
using quorvel::PropertyValue;
using namespace quorvel::capi;

static_assert(static_cast<int>(PropertyKind::none) == QUORVEL_NONE);
static_assert(static_cast<int>(PropertyKind::boolean) == QUORVEL_BOOLEAN);
static_assert(static_cast<int>(PropertyKind::integer) == QUORVEL_INTEGER);
static_assert(static_cast<int>(PropertyKind::real) == QUORVEL_REAL);
static_assert(static_cast<int>(PropertyKind::date) == QUORVEL_DATE);
static_assert(static_cast<int>(PropertyKind::string) == QUORVEL_STRING);
static_assert(static_cast<int>(PropertyKind::data) == QUORVEL_DATA);
static_assert(static_cast<int>(PropertyKind::array) == QUORVEL_ARRAY);
static_assert(static_cast<int>(PropertyKind::dictionary) == QUORVEL_DICTIONARY);

namespace {

template <typename Number, typename Read>
bool give(const Read& read, Number* result) noexcept {
  if (!read) return false;
  *result = *read;
  return true;
}

bool give_double(const quorvel_value* value, PropertyKind kind, double* result) noexcept {
  const Lent lent(value);
  if (lent->kind() != kind) return false;
  *result = lent->to_double();
  return true;
}

}  // namespace

quorvel_value* quorvel_boolean_new(bool boolean) { return hand_out(PropertyValue::boolean(boolean)); }
quorvel_value* quorvel_integer_new(int64_t integer) { return hand_out(PropertyValue::integer(integer)); }
quorvel_value* quorvel_unsigned_new(uint64_t integer) { return hand_out(PropertyValue::unsigned_integer(integer)); }
quorvel_value* quorvel_real_new(double real) { return hand_out(PropertyValue::real(real)); }
quorvel_value* quorvel_date_new(double seconds) { return hand_out(PropertyValue::date(seconds)); }

quorvel_value* quorvel_string_new(const char* text) {
  return text != nullptr ? hand_out(PropertyValue::string(text)) : nullptr;
}

quorvel_value* quorvel_string_new_with_length(const char* text, size_t length) {
  return text != nullptr ? hand_out(PropertyValue::string({text, length})) : nullptr;
}

quorvel_value* quorvel_data_new(const void* bytes, size_t length) {
  if (bytes == nullptr && length > 0) return nullptr;
  return hand_out(PropertyValue::data({static_cast<const std::byte*>(bytes), length}));
}

quorvel_value* quorvel_value_copy(const quorvel_value* value) { return hand_out(*Lent(value)); }

void quorvel_value_free(quorvel_value* value) { static_cast<void>(take_over(value)); }

quorvel_kind quorvel_value_kind(const quorvel_value* value) { return static_cast<quorvel_kind>(Lent(value)->kind()); }

bool quorvel_value_equal(const quorvel_value* left, const quorvel_value* right) { return *Lent(left) == *Lent(right); }

bool quorvel_boolean_get(const quorvel_value* value, bool* result) {
  const Lent lent(value);
  if (lent->kind() != PropertyKind::boolean) return false;
  *result = lent->to_boolean();
  return true;
}

bool quorvel_integer_get(const quorvel_value* value, int64_t* result) { return give(Lent(value)->to_int64(), result); }

bool quorvel_unsigned_get(const quorvel_value* value, uint64_t* result) {
  return give(Lent(value)->to_uint64(), result);
}

bool quorvel_real_get(const quorvel_value* value, double* result) {
  return give_double(value, PropertyKind::real, result);
}

bool quorvel_date_get(const quorvel_value* value, double* result) {
  return give_double(value, PropertyKind::date, result);
}

const char* quorvel_string_get(const quorvel_value* value, size_t* length) {
  const std::string_view text = Lent(value)->text();
  *length = text.size();
  return text.data();
}

size_t quorvel_string_copy(const quorvel_value* value, char* buffer, size_t size) {
  const std::string_view text = Lent(value)->text();
  if (size > 0) {
    quorvel::TextSink sink(std::span(buffer, size - 1));
    sink.put(text);
    *sink.position() = '\0';
  }
  return text.size();
}

const void* quorvel_data_get(const quorvel_value* value, size_t* length) {
  const std::span<const std::byte> bytes = Lent(value)->bytes();
  *length = bytes.size();
  return bytes.data();
}

size_t quorvel_value_describe(const quorvel_value* value, char* buffer, size_t size) {
  if (size == 0) return 0;
  quorvel::TextSink sink(std::span(buffer, size - 1));
  describe(*Lent(value), sink);
  *sink.position() = '\0';
  return static_cast<size_t>(sink.position() - buffer);
}
