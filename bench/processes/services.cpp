// The daemon, the limit (a server that reads the file and sends it) and, where it is built, sd-bus with msgpack.
#include <cstring>
#include <stdexcept>

#include "bench/contenders/quorvel_codec.h"
#include "bench/processes/child.h"
#include "bench/processes/sd_bus_service.h"
#include "bench/processes/service.h"
#include "bench/support/files.h"
#include "bench/support/scratch_root.h"
#include "property/binary/format.h"
#include "protocol/quorvel_protocol.h"
#include "wire/frame.h"
#include "wire/service_path.h"

namespace quorvel::bench {
namespace {

class DaemonService : public Service {
 public:
  [[nodiscard]] std::string name() const override { return std::string(kOurs); }
  void provide(const DataSet& data) override {
    replace_file(scratch_root().images_file(), QuorvelCodec::encode(to_property(data)).bytes(), Flushing::none);
  }
  [[nodiscard]] std::filesystem::path socket() const override {
    std::string path = scratch_root().root();
    return path.append(wire::kServiceDirectory).append("/").append(protocol::kServiceName).append(wire::kSocketSuffix);
  }
  [[nodiscard]] std::string request() const override {
    ByteBuffer frame;
    if (!wire::append_frame(wire::FrameKind::call, 0, 1, protocol::kCopyRegulatoryImages, nullptr, frame)) {
      throw std::runtime_error("cannot make a call");
    }
    return {reinterpret_cast<const char*>(frame.data()), frame.size()};
  }
  [[nodiscard]] std::size_t reply_length(std::span<const std::byte> head) const override {
    return wire::kFrameHeadSize + binary_format::get_integer(head.data(), 4);
  }
  [[nodiscard]] bool holds(std::span<const std::byte> reply, const DataSet& data) const override {
    wire::Frame frame;
    return wire::parse_frame(reply, UINT32_MAX, frame) == wire::FrameResult::complete &&
           frame.head.kind == wire::FrameKind::reply &&
           matches(read_binary(frame.payload, Mutability::immutable), data);
  }

 private:
  Child daemon_{{QUORVELD_PATH}};
};

class BareService : public Service {
 public:
  [[nodiscard]] std::string name() const override { return std::string(kLimit); }
  void provide(const DataSet& data) override {
    replace_file(file(), QuorvelCodec::encode(to_property(data)).bytes(), Flushing::none);
  }
  [[nodiscard]] std::filesystem::path socket() const override { return scratch_root().outside() / "bare.sock"; }
  [[nodiscard]] std::string request() const override { return std::string(kReplyHead, '?'); }
  [[nodiscard]] std::size_t reply_length(std::span<const std::byte> head) const override {
    return kReplyHead + binary_format::get_integer(head.data(), 8);
  }
  [[nodiscard]] bool holds(std::span<const std::byte> reply, const DataSet& data) const override {
    return matches(read_binary(reply.subspan(kReplyHead), Mutability::immutable), data);
  }

 private:
  static std::filesystem::path file() { return scratch_root().outside() / "images"; }

  Child server_{{BARE_SERVER_PATH, socket(), file()}, false};
};

}  // namespace

std::vector<std::unique_ptr<Service>> make_services() {
  std::vector<std::unique_ptr<Service>> services;
  services.push_back(std::make_unique<DaemonService>());
  services.push_back(std::make_unique<BareService>());
  if (auto contender = make_sd_bus_service()) services.push_back(std::move(contender));
  return services;
}

}  // namespace quorvel::bench
