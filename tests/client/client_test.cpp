// The client library against services that misbehave, and the errors it reports.
#include "quorvel/client.h"

#include <sys/syscall.h>

#include <future>

#include "protocol/quorvel_protocol.h"
#include "quorvel/observer.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::client {
namespace {

using namespace quorvel::test;

constexpr const char* kService = "com.Orvane.quorveld.sock";
const std::string kSocket = "/run/quorvel/com.Orvane.quorveld.sock";

class ClientTest : public testing::Test {
 protected:
  // A root whose path is far longer than a socket address.
  ScratchRoot root{std::string(150, 'a') + "/" + std::string(150, 'b')};
};

TEST_F(ClientTest, SendsACallThatNoSocketBufferHolds) {
  const PropertyValue argument = test::data(std::string(4 << 20, 'x'));
  Options options;
  options.timeout = 100ms;
  const Descriptor listener = listen_on(kService);
  EXPECT_EQ(Client(options).call("operation", argument).error->code, ErrorCode::timed_out) << "nobody reads";
  static_cast<void>(accept_from(listener));
  std::thread service([&] {
    SocketPeer connection = accept_from(listener);
    std::this_thread::sleep_for(50ms);
    const auto call = connection.receive();
    EXPECT_TRUE(call && call->value == argument);
    connection.send(frame_bytes(wire::FrameKind::reply, 1, "", text("answer")));
  });
  EXPECT_EQ(Client().call("operation", argument).value, text("answer"));
  service.join();
}

TEST_F(ClientTest, TellsWhyThereIsNoService) {
  const auto error_of = [](const Options& options) {
    const Reply reply = Client(options).call("operation");
    return reply.error ? std::optional(reply.error->code) : std::nullopt;
  };
  EXPECT_EQ(error_of({}), ErrorCode::service_absent);
  EXPECT_EQ(Client().call("operation").error->description,
            "Cannot connect to " + kSocket + " in the device root: No such file or directory");
  root.write_file(kSocket, "no socket");
  EXPECT_EQ(error_of({}), ErrorCode::service_absent);
  EXPECT_EQ(error_of({.root = "relative"}), ErrorCode::invalid_root);
  EXPECT_EQ(error_of({.root = root.path("/nowhere")}), ErrorCode::invalid_root);
  EXPECT_EQ(error_of({.service = "../telvane"}), ErrorCode::invalid_argument);
  EXPECT_EQ(error_of({.service = std::string(200, 'x')}), ErrorCode::invalid_argument);
  EXPECT_EQ(Client().call(std::string(300, 'x')).error->code, ErrorCode::invalid_argument);
  if (::geteuid() == 0) {
    const Descriptor service = listen_on(kService);
    root.set_mode(kSocket, 0600);
    std::filesystem::permissions(root.outside(), std::filesystem::perms(0755));
    ASSERT_EQ(::syscall(SYS_setresuid, -1, 12345, -1), 0);  // of this thread alone
    EXPECT_EQ(error_of({}), ErrorCode::access_denied);
    ASSERT_EQ(::syscall(SYS_setresuid, -1, 0, -1), 0);
  }
  root.remove("/run");
  EXPECT_EQ(error_of({}), ErrorCode::service_absent);
}

TEST_F(ClientTest, CompletesOnceOnAThreadOfItsOwn) {
  // A link in the socket's place is taken inside the device root, as every path is.
  root.make_link("/run/quorvel/elsewhere.sock", kSocket);
  const FakeService service("elsewhere.sock", {frame_bytes(wire::FrameKind::reply, 1, "", text("answer"))}, false);
  std::promise<std::pair<std::thread::id, std::string>> completed;
  {
    const PendingCall call = Client().copy_regulatory_images([&completed](const Reply& reply) {
      completed.set_value({std::this_thread::get_id(), std::string(reply.value.text())});
    });
  }
  const auto [thread, value] = completed.get_future().get();
  EXPECT_NE(thread, std::this_thread::get_id());
  EXPECT_EQ(value, "answer");
}

TEST_F(ClientTest, ObservesNotificationsAndWhatItMissed) {
  using Kind = wire::FrameKind;
  const FakeService service(
      "notifications.sock",
      {frame_bytes(Kind::ready, 41, "", {}), frame_bytes(Kind::notification, 42, "changed", text("changed")),
       frame_bytes(Kind::missed, 50, "", PropertyValue::integer(8)), frame_bytes(Kind::reply, 1, "", {})},
      true);
  Observer observer;
  ASSERT_FALSE(observer.connect());
  EXPECT_EQ(observer.first_sequence(), 41u);
  Event event;
  ASSERT_FALSE(observer.next(event, 20s));
  EXPECT_EQ(event.sequence, 42u);
  EXPECT_EQ(event.name, "changed");
  EXPECT_EQ(event.object, text("changed"));
  ASSERT_FALSE(observer.next(event, 20s));
  EXPECT_EQ(event.sequence, 50u);
  EXPECT_EQ(event.missed, 8u);
  EXPECT_EQ(observer.next(event, 20s)->code, ErrorCode::protocol_error);
  EXPECT_EQ(observer.next(event, 20s)->code, ErrorCode::disconnected);
}

}  // namespace
}  // namespace quorvel::client
