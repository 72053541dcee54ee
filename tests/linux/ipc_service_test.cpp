// The IPC service against real clients: well-behaved, odd and hostile.
#include <sys/socket.h>

#include <array>
#include <thread>

#include "platform/ipc.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::test {
namespace {

using platform::IpcCall;
using platform::IpcError;
using platform::IpcReply;
using wire::FrameKind;

constexpr const char* kSocket = "com.example.service.sock";
constexpr std::size_t kLargeSize = 8u << 20;

std::atomic<int> calls_of_silent = 0;
std::atomic<int> callers_of_meet = 0;

void echo(void*, const IpcCall& call, IpcReply& reply) noexcept {
  if (call.caller.user != ::getuid() || call.caller.process != ::getpid()) return;
  reply.send(call.argument, nullptr);
  reply.send(call.argument, nullptr);  // one too many, which nobody may notice
}
void fail(void*, const IpcCall&, IpcReply& reply) noexcept {
  const IpcError error = {-7, "it failed"};
  reply.send(nullptr, &error);
}
void silent(void*, const IpcCall&, IpcReply&) noexcept { ++calls_of_silent; }
void large(void* text, const IpcCall&, IpcReply& reply) noexcept {
  reply.send(*static_cast<const PropertyValue*>(text), nullptr);
}
// Answers only while another call of it runs.
void meet(void*, const IpcCall&, IpcReply& reply) noexcept {
  ++callers_of_meet;
  if (eventually([] { return callers_of_meet >= 2; }, 5s)) reply.send(nullptr, nullptr);
}

constexpr platform::IpcOperation kOperations[] = {
    {"echo", echo}, {"fail", fail}, {"silent", silent}, {"large", large}, {"meet", meet}};
constexpr platform::IpcInterface kInterface = {"Example", kOperations};

class IpcService : public testing::Test {
 protected:
  IpcService() {
    root.make_directory("/run/quorvel");
    start();
  }
  ~IpcService() override { stop(); }

  void start() {
    listener = platform::create_listener("com.example.service");
    platform::set_delegate(
        listener, {&large_text, [](void* object, platform::IpcListener*, platform::IpcConnection* connection) noexcept {
                     platform::set_exported_interface(connection, &kInterface);
                     platform::set_exported_object(connection, object);
                     platform::resume(connection);
                     return true;
                   }});
    ASSERT_EQ(platform::resume(listener), 0);
  }
  void stop() {
    if (listener != nullptr) platform::release_listener(std::exchange(listener, nullptr));
  }

  static SocketPeer client() { return SocketPeer::connected_to(kSocket); }
  static std::string call(std::string_view operation, std::uint64_t serial, const PropertyValue& argument = nullptr,
                          std::uint8_t flags = 0) {
    return frame_bytes(FrameKind::call, serial, operation, argument, flags);
  }
  static void expect_served(SocketPeer& peer, std::chrono::milliseconds patience = kPatience) {
    static std::uint64_t serial = 1000;
    ASSERT_TRUE(peer.send(call("echo", ++serial, text("hello"))));
    const auto reply = peer.receive(patience);
    ASSERT_TRUE(reply);
    EXPECT_EQ(reply->kind, FrameKind::reply);
    EXPECT_EQ(reply->serial, serial);
    EXPECT_EQ(reply->value, text("hello"));
  }

  ScratchRoot root;
  PropertyValue large_text = text(std::string(kLargeSize, 'L'));
  platform::IpcListener* listener = nullptr;
};

TEST_F(IpcService, AnswersEveryCallAndKeepsTheConnection) {
  EXPECT_EQ(root.mode_of(std::string("/run/quorvel/") + kSocket), 0666u);
  SocketPeer peer = client();
  std::string garbled = call("echo", 4, text("argument"));
  garbled.back() = '\x7f';
  const struct {
    std::string bytes;
    FrameKind kind;
    PropertyValue value;
  } cases[] = {
      {call("echo", 1), FrameKind::reply, nullptr},
      {call("fail", 2), FrameKind::failure, dictionary({{"Code", -7}, {"Description", "it failed"}})},
      {call("nothing", 3), FrameKind::failure,
       dictionary({{"Code", 1}, {"Description", "there is no operation of this name"}})},
      {garbled, FrameKind::failure,
       dictionary({{"Code", 2}, {"Description", "the argument is not a binary property list"}})},
      {call("", 5), FrameKind::failure,
       dictionary({{"Code", 1}, {"Description", "there is no operation of this name"}})},
      {call("echo", 6, nullptr, wire::kFlagNoReply) + call("silent", 7) + call("echo", 7), FrameKind::reply, nullptr},
  };
  std::uint64_t serial = 0;
  for (const auto& c : cases) {
    ++serial;
    ASSERT_TRUE(peer.send(c.bytes));
    const auto reply = peer.receive();
    ASSERT_TRUE(reply) << serial;
    EXPECT_EQ(reply->kind, c.kind) << serial;
    EXPECT_EQ(reply->serial, serial == 6 ? 7 : serial);
    EXPECT_EQ(reply->value, c.value) << serial;
  }
  EXPECT_EQ(calls_of_silent, 1);
  for (const char byte : call("echo", 8)) ASSERT_TRUE(peer.send({&byte, 1}));
  EXPECT_EQ(peer.receive()->serial, 8u);
  // A frame nearly as large as a call may be.
  const PropertyValue argument = text(std::string(16'000, 'x'));
  ASSERT_TRUE(peer.send(call("echo", 9, argument)));
  EXPECT_EQ(peer.receive()->value, argument);
  std::string many;
  for (std::uint64_t number = 10; number < 2000; ++number) many += call("echo", number, text("pipelined"));
  ASSERT_TRUE(peer.send(many));
  for (std::uint64_t number = 10; number < 2000; ++number) ASSERT_EQ(peer.receive()->serial, number);
}

// Each thread encodes its replies into one buffer.
TEST(Frame, ABufferThatIsUsedAgainKeepsItsSize) {
  const PropertyValue value = dictionary({{"key", std::string(1000, 'x')}});
  ByteBuffer frame;
  std::size_t capacity = 0;
  for (int i = 0; i < 20; ++i) {
    frame.clear();
    ASSERT_TRUE(wire::append_frame(FrameKind::reply, 0, 1, "", value, frame));
    if (i == 0) capacity = frame.capacity();
  }
  EXPECT_EQ(frame.capacity(), capacity);
}

TEST_F(IpcService, RefusesAttachedDescriptorsWhereTheKernelCan) {
  SocketPeer peer = client();
  int none = 1;
  socklen_t size = sizeof none;
  constexpr int kPassRights = 83;
  if (::getsockopt(peer.descriptor(), SOL_SOCKET, kPassRights, &none, &size) != 0)
    GTEST_SKIP() << "this kernel cannot refuse descriptors";
  EXPECT_EQ(send_attached(peer.descriptor(), call("echo", 1), std::array{STDERR_FILENO}), -1);
  EXPECT_EQ(errno, EPERM);
  expect_served(peer);
}

TEST_F(IpcService, ARefusedFrameClosesItsConnectionAndNoOther) {
  SocketPeer neighbour = client();
  expect_served(neighbour);
  const auto with = [](std::size_t offset, std::string_view bytes) {
    return call("echo", 1, text("x")).replace(offset, bytes.size(), bytes);
  };
  const std::string cases[] = {
      with(0, "\xff\xff\xff\xff"),               // a body of 4 GiB
      with(0, std::string_view("\0\1\0\1", 4)),  // one byte more than a call may have
      with(0, std::string_view("\0\0\0\0", 4)),  // a body shorter than its name
      with(4, std::string_view("\0", 1)),        // no kind
      with(4, "\x09"),                           // an unknown kind
      with(4, "\x02"),                           // a reply
      with(5, "\x02"),                           // an unknown flag
      with(6, "\xff\xff"),                       // a name longer than any
      with(16, "\n"),                            // a name that is not printable
      "GET / HTTP/1.1\r\n\r\n",
  };
  for (const std::string& bytes : cases) {
    SocketPeer peer = client();
    EXPECT_TRUE(peer.send(bytes));
    EXPECT_TRUE(peer.is_closed()) << bytes;
  }
  expect_served(neighbour);
}

TEST_F(IpcService, ServesAClientThatEndedItsSending) {
  SocketPeer peer = client();
  ASSERT_TRUE(peer.send(call("large", 1) + call("large", 2)));
  peer.end_sending();
  EXPECT_EQ(peer.receive()->value, large_text);
  EXPECT_EQ(peer.receive()->serial, 2u);
  EXPECT_TRUE(peer.is_closed());
  SocketPeer half = client();
  ASSERT_TRUE(half.send(call("echo", 1).substr(0, 10)));
  half.end_sending();
  EXPECT_TRUE(half.is_closed());
}

TEST_F(IpcService, AnswersCallsThatAreUnderWayWhenItEnds) {
  const std::size_t open_before = descriptors_open();
  SocketPeer fresh = client();
  SocketPeer halfway = client();
  const std::string bytes = call("echo", 7, text("hello"));
  ASSERT_TRUE(halfway.send(bytes.substr(0, 5)));
  ASSERT_TRUE(eventually([&] { return descriptors_open() == open_before + 4; })) << "both were let in";
  std::thread ending([&] { stop(); });
  EXPECT_TRUE(eventually([&] { return !root.exists(std::string("/run/quorvel/") + kSocket); }));
  ASSERT_TRUE(halfway.send(bytes.substr(5)));
  ASSERT_TRUE(fresh.send(bytes));
  for (SocketPeer* peer : {&halfway, &fresh}) {
    const auto reply = peer->receive();
    ASSERT_TRUE(reply);
    EXPECT_EQ(reply->serial, 7u);
  }
  ending.join();
}

TEST_F(IpcService, RunsCallsOfTwoClientsAtOnce) {
  SocketPeer first = client();
  SocketPeer second = client();
  ASSERT_TRUE(first.send(call("meet", 1)));
  ASSERT_TRUE(second.send(call("meet", 2)));
  EXPECT_TRUE(first.receive());
  EXPECT_TRUE(second.receive());
}

TEST_F(IpcService, AHalfSentCallHasItsTimeAndAnIdleClientStays) {
  SocketPeer idle = client();
  expect_served(idle);
  SocketPeer trickling = client();
  ASSERT_TRUE(trickling.send(call("echo", 1).substr(0, 5)));
  EXPECT_FALSE(trickling.is_closed(6s));
  ASSERT_TRUE(trickling.send(call("echo", 1).substr(5, 5)));
  EXPECT_TRUE(trickling.is_closed(8s)) << "each byte bought more time";
  expect_served(idle);
}

}  // namespace
}  // namespace quorvel::test
