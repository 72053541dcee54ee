#include "client.h"

#include <cstring>

#include "protocol/quorvel_protocol.h"

using namespace quorvel::capi;
using quorvel::client::Progress;

static_assert(quorvel::protocol::kCopyRegulatoryImages == QUORVEL_COPY_REGULATORY_IMAGES);

bool OwnedText::set(const char* text) noexcept {
  char* copy = nullptr;
  if (text != nullptr) {
    const std::size_t size = std::strlen(text) + 1;
    copy = static_cast<char*>(std::malloc(size));
    if (copy == nullptr) return false;
    std::memcpy(copy, text, size);
  }
  std::free(std::exchange(text_, copy));
  return true;
}

quorvel::client::Target quorvel_client::target() const noexcept {
  return {root.get(), service.get() != nullptr ? service.get() : quorvel::protocol::kServiceName, time_limit,
          maximum_reply};
}

quorvel_client* quorvel_client_new(void) { return make<quorvel_client>(); }

void quorvel_client_free(quorvel_client* client) { unmake(client); }

int quorvel_client_set_root(quorvel_client* client, const char* root) {
  if (client == nullptr) return QUORVEL_INVALID_ARGUMENT;
  return client->root.set(root) ? QUORVEL_OK : QUORVEL_SYSTEM_FAILURE;
}

int quorvel_client_set_service(quorvel_client* client, const char* service) {
  if (client == nullptr) return QUORVEL_INVALID_ARGUMENT;
  return client->service.set(service) ? QUORVEL_OK : QUORVEL_SYSTEM_FAILURE;
}

void quorvel_client_set_time_limit(quorvel_client* client, int64_t milliseconds) {
  if (client != nullptr) client->time_limit = milliseconds;
}

void quorvel_client_set_maximum_reply(quorvel_client* client, uint32_t bytes) {
  if (client != nullptr) client->maximum_reply = bytes;
}

int quorvel_client_call(const quorvel_client* client, const char* operation, const quorvel_value* argument,
                        quorvel_value** reply, quorvel_error* error) {
  *reply = nullptr;
  if (client == nullptr || operation == nullptr) {
    return tell(QUORVEL_INVALID_ARGUMENT, "A call needs a client and an operation.", error);
  }
  quorvel::client::Failure failure;
  quorvel::client::Call call;
  if (!call.open(client->target(), operation, *Lent(argument), failure)) return tell(failure, error);
  quorvel::PropertyValue value;
  Progress progress;
  while ((progress = call.step(value, failure)) == Progress::waiting) sleep_until_due(call.wait());
  if (progress == Progress::failed) return tell(failure, error);
  *reply = hand_out(std::move(value));
  return QUORVEL_OK;
}

int quorvel_client_copy_regulatory_images(const quorvel_client* client, quorvel_value** images, quorvel_error* error) {
  return quorvel_client_call(client, QUORVEL_COPY_REGULATORY_IMAGES, nullptr, images, error);
}
