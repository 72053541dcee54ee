// Calls without waiting.
#include "client.h"
#include "readiness.h"

using namespace quorvel::capi;
using quorvel::client::Progress;

struct quorvel_call {
  quorvel::client::Call call;
  Readiness readiness;
  bool ended = false;
};

quorvel_call* quorvel_call_start(const quorvel_client* client, const char* operation, const quorvel_value* argument,
                                 quorvel_error* error) {
  if (client == nullptr || operation == nullptr) {
    tell(QUORVEL_INVALID_ARGUMENT, "A call needs a client and an operation.", error);
    return nullptr;
  }
  auto* started = make<quorvel_call>();
  if (started == nullptr) {
    tell_out_of_memory(error);
    return nullptr;
  }
  quorvel::client::Failure failure;
  if (started->call.open(client->target(), operation, *Lent(argument), failure) && started->readiness.open(failure) &&
      started->readiness.follow(started->call.wait(), failure)) {
    return started;
  }
  unmake(started);
  tell(failure, error);
  return nullptr;
}

void quorvel_call_free(quorvel_call* call) { unmake(call); }

int quorvel_call_descriptor(const quorvel_call* call) { return call != nullptr ? call->readiness.descriptor() : -1; }

int quorvel_call_step(quorvel_call* call, quorvel_value** reply, quorvel_error* error) {
  *reply = nullptr;
  if (call == nullptr || call->ended) return tell(QUORVEL_INVALID_ARGUMENT, "There is no call under way.", error);
  quorvel::client::Failure failure;
  quorvel::PropertyValue value;
  const Progress progress = call->call.step(value, failure);
  if (progress == Progress::waiting && call->readiness.follow(call->call.wait(), failure)) return QUORVEL_NOT_YET;
  call->ended = true;
  if (progress != Progress::done) return tell(failure, error);
  *reply = hand_out(std::move(value));
  return QUORVEL_OK;
}
