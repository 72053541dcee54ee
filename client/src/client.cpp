#include "quorvel/client.h"

#include <system_error>

#include "client/core/call.h"
#include "conversions.h"
#include "protocol/quorvel_protocol.h"

namespace quorvel::client {

Target target_of(const Options& options) noexcept {
  return {options.root.empty() ? nullptr : options.root.c_str(),
          options.service.empty() ? protocol::kServiceName : options.service, options.timeout.count(),
          options.maximum_reply};
}

Reply Client::call(std::string_view operation, const PropertyValue& argument) const {
  Failure failure;
  Call call;
  Reply reply;
  if (!call.open(target_of(options_), operation, argument, failure)) return {{}, error_of(failure)};
  for (;;) {
    switch (call.step(reply.value, failure)) {
      case Progress::done: return reply;
      case Progress::failed: return {{}, error_of(failure)};
      case Progress::waiting: sleep_until_due(call.wait());
    }
  }
}

PendingCall Client::call(std::string_view operation, const PropertyValue& argument, Completion completion) const {
  auto run = [client = *this, name = std::string(operation), argument, completion] {
    completion(client.call(name, argument));
  };
  try {
    return PendingCall(std::thread(run));
  } catch (const std::system_error& refusal) {
    completion({{}, Error{ErrorCode::system_failure, 0, std::string("No thread can be had: ") + refusal.what()}});
    return {};
  }
}

Reply Client::copy_regulatory_images() const { return call(protocol::kCopyRegulatoryImages); }

PendingCall Client::copy_regulatory_images(Completion completion) const {
  return call(protocol::kCopyRegulatoryImages, {}, std::move(completion));
}

void PendingCall::wait() noexcept {
  if (!thread_.joinable()) return;
  if (thread_.get_id() == std::this_thread::get_id()) {
    thread_.detach();
  } else {
    thread_.join();
  }
}

}  // namespace quorvel::client
