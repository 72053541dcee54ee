// What the telephony service sends, through the stream that the daemon reads it from. The input's first two bytes say
// where its bytes are cut in two.
#include <sys/socket.h>

#include <filesystem>

#include "linux/base/local_socket.h"
#include "linux/telephony/telephony_stream.h"
#include "support/values.h"
#include "target.h"
#include "wire/service_path.h"
#include "wire/telephony_answers.h"
#include "wire/telephony_state.h"

namespace quorvel::fuzz {
namespace {

using platform::host::TelephonyStream;

// A device root with the service's socket in it.
class Service {
 public:
  Service() {
    require(::mkdtemp(root_) != nullptr && ::setenv("QUORVEL_ROOT", root_, 1) == 0, "no scratch directory");
    std::filesystem::create_directories(root_ + std::string(wire::kServiceDirectory));
    socket_ = platform::host::ListeningSocket::open(wire::kTelephonySocket);
  }
  ~Service() {
    socket_ = {};
    std::filesystem::remove_all(root_);
  }
  [[nodiscard]] Descriptor accept() const { return Descriptor(::accept(socket_.get(), nullptr, nullptr)); }

 private:
  char root_[32] = "/tmp/quorvel-fuzz-XXXXXX";
  platform::host::ListeningSocket socket_;
};

void ask_everything(const wire::Frame& frame) {
  const PropertyValue state = wire::state_of(frame);
  for (const std::string_view field : wire::kStateFields) {
    PropertyValue value;
    wire::take_answer(state, field, value);
    const char* fault = value ? test::round_trip_fault(value) : nullptr;
    require(fault == nullptr, fault);
  }
}

TelephonyStream::Result serve(TelephonyStream& stream) {
  wire::Frame frame;
  TelephonyStream::Result result;
  while ((result = stream.next(frame)) == TelephonyStream::Result::frame) ask_everything(frame);
  return result;
}

}  // namespace

void run_once(Bytes input) {
  static const Service service;
  Input parts(input.first(input.size() < 65536 ? input.size() : 65536));
  TelephonyStream stream;
  require(stream.connect() == TelephonyStream::Connection::open, "no connection");
  Descriptor peer = service.accept();
  const Bytes head = parts.take(parts.number(2));
  for (const Bytes part : {head, parts.rest()}) {
    ::send(peer.get(), part.data(), part.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
    if (serve(stream) == TelephonyStream::Result::gone) return;
  }
  peer = Descriptor();
  require(serve(stream) == TelephonyStream::Result::gone, "a service that left is not missed");
}

}  // namespace quorvel::fuzz
