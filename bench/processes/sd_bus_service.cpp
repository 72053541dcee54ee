#include "bench/processes/sd_bus_service.h"

#include <unistd.h>

#include <cstdint>
#include <cstring>
#include <string_view>

#include "bench/contenders/msgpack_codec.h"
#include "bench/processes/child.h"
#include "bench/processes/sd_bus_names.h"
#include "bench/support/files.h"
#include "bench/support/scratch_root.h"

namespace quorvel::bench {
namespace {

// A message begins with byte order, type, flags, version, body length, serial and the length of the header's fields,
// which are padded to eight bytes before the body.
constexpr std::size_t kBodyLengthAt = 4;
constexpr std::size_t kFieldsLengthAt = 12;
constexpr std::size_t kFieldsAt = 16;

std::uint32_t number_at(std::span<const std::byte> bytes, std::size_t at) {
  std::uint32_t number = 0;
  std::memcpy(&number, bytes.data() + at, sizeof number);
  return number;
}
void put_number(std::string& out, std::uint32_t number) {
  out.append(reinterpret_cast<const char*>(&number), sizeof number);
}
constexpr std::size_t padded(std::size_t length) { return (length + 7) / 8 * 8; }

void put_field(std::string& out, char code, char type, std::string_view text) {
  out.resize(padded(out.size()));
  out.append({code, 1, type, 0});
  put_number(out, static_cast<std::uint32_t>(text.size()));
  out.append(text).push_back('\0');
}

class SdBusService : public Service {
 public:
  [[nodiscard]] std::string name() const override { return "sd-bus"; }
  void provide(const DataSet& data) override {
    const msgpack::sbuffer encoded = MsgpackCodec::encode(MsgpackCodec::make(data));
    replace_file(file(), MsgpackCodec::bytes(encoded), Flushing::none);
  }
  [[nodiscard]] std::filesystem::path socket() const override { return scratch_root().outside() / "sd-bus.sock"; }
  [[nodiscard]] std::string greeting() const override {
    std::string user;
    constexpr char kDigits[] = "0123456789abcdef";
    for (const char digit : std::to_string(::getuid())) user.append({kDigits[digit >> 4], kDigits[digit & 15]});
    return std::string(1, '\0') + "AUTH EXTERNAL " + user + "\r\nBEGIN\r\n";
  }
  [[nodiscard]] std::size_t greeting_lines() const override { return 1; }
  [[nodiscard]] std::string request() const override {
    std::string fields(kFieldsAt, '\0');
    put_field(fields, 1, 'o', kBusPath);
    put_field(fields, 2, 's', kBusInterface);
    put_field(fields, 3, 's', kBusMember);
    std::string message = {'l', 1, 0, 1};
    put_number(message, 0);
    put_number(message, 1);
    put_number(message, static_cast<std::uint32_t>(fields.size() - kFieldsAt));
    message += fields.substr(kFieldsAt);
    message.resize(padded(message.size()));
    return message;
  }
  [[nodiscard]] std::size_t reply_length(std::span<const std::byte> head) const override {
    return kFieldsAt + padded(number_at(head, kFieldsLengthAt)) + number_at(head, kBodyLengthAt);
  }
  [[nodiscard]] bool holds(std::span<const std::byte> reply, const DataSet& data) const override {
    // The body is the length of an array of bytes and the bytes.
    const std::size_t length = number_at(reply, kBodyLengthAt) - sizeof(std::uint32_t);
    return MsgpackCodec::matches(MsgpackCodec::decode(reply.last(length)), data);
  }

 private:
  static std::filesystem::path file() { return scratch_root().outside() / "images.msgpack"; }

  Child server_{{SD_BUS_SERVER_PATH, socket(), file()}, false};
};

}  // namespace

std::unique_ptr<Service> make_sd_bus_service() { return std::make_unique<SdBusService>(); }

}  // namespace quorvel::bench
