// A contender of the daemon: answers a method call over sd-bus, peer to peer, by reading a msgpack file, decoding it
// and encoding the reply.
//
//   bench_sd_bus_server SOCKET FILE
#include <sys/epoll.h>
#include <sys/socket.h>
#include <systemd/sd-bus.h>
#include <systemd/sd-event.h>

#include <iostream>
#include <stdexcept>

#include "bench/contenders/msgpack_codec.h"
#include "bench/processes/local_socket.h"
#include "bench/processes/sd_bus_names.h"
#include "bench/support/files.h"

namespace quorvel::bench {
namespace {

void require(int result) {
  if (result < 0) throw std::system_error(-result, std::generic_category(), "sd-bus");
}

const char* file;
sd_event* loop;

int copy_images(sd_bus_message* call, void*, sd_bus_error*) {
  const FileBytes content = read_file(file);
  const MsgpackTree images = MsgpackCodec::decode(content.bytes());
  const msgpack::sbuffer encoded = MsgpackCodec::encode(images);
  sd_bus_message* reply = nullptr;
  int result = sd_bus_message_new_method_return(call, &reply);
  if (result >= 0) result = sd_bus_message_append_array(reply, 'y', encoded.data(), encoded.size());
  if (result >= 0) result = sd_bus_send(nullptr, reply, nullptr);
  sd_bus_message_unref(reply);
  return result;
}

constexpr sd_bus_vtable kMethods[] = {SD_BUS_VTABLE_START(0),
                                      SD_BUS_METHOD(kBusMember, "", "ay", copy_images, SD_BUS_VTABLE_UNPRIVILEGED),
                                      SD_BUS_VTABLE_END};

int accept_client(sd_event_source*, int listener, std::uint32_t, void*) {
  const int client = ::accept4(listener, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
  if (client < 0) return 0;
  // Lives as long as this server, which serves a few hundred clients in all.
  sd_bus* bus = nullptr;
  sd_id128_t identity{};
  require(sd_id128_randomize(&identity));
  require(sd_bus_new(&bus));
  require(sd_bus_set_fd(bus, client, client));
  require(sd_bus_set_server(bus, 1, identity));
  require(sd_bus_set_anonymous(bus, 1));
  require(sd_bus_add_object_vtable(bus, nullptr, kBusPath, kBusInterface, kMethods, nullptr));
  require(sd_bus_start(bus));
  require(sd_bus_attach_event(bus, loop, 0));
  return 0;
}

int run(const char* socket) {
  const Descriptor listener = listen_on(socket);
  require(sd_event_new(&loop));
  require(sd_event_add_io(loop, nullptr, listener.get(), EPOLLIN, accept_client, nullptr));
  return sd_event_loop(loop);
}

}  // namespace
}  // namespace quorvel::bench

int main(int argc, char** argv) {
  if (argc != 3) return 2;
  try {
    quorvel::bench::file = argv[2];
    return quorvel::bench::run(argv[1]);
  } catch (const std::exception& error) {
    std::cerr << "bench_sd_bus_server: " << error.what() << '\n';
    return 1;
  }
}
