// The system notification center against real observers.
#include "platform/notification_center.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "platform/host/socket_peer.h"
#include "platform/process.h"
#include "support/descriptors.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

using platform::post_notification;
using wire::FrameKind;

class NotificationCenter : public testing::Test {
 protected:
  NotificationCenter() { EXPECT_EQ(platform::start_process(), 0); }

  static SocketPeer observer() { return SocketPeer::connected_to("notifications.sock"); }

  ScratchRoot root;
};

TEST_F(NotificationCenter, WhoeverIsConnectedBeforeAPostReceivesIt) {
  const std::size_t open_before = descriptors_open();
  for (std::int64_t i = 1; i <= 300; ++i) {
    SocketPeer peer = observer();
    post_notification(text("com.example.changed"), PropertyValue::integer(i));
    const auto ready = peer.receive();
    ASSERT_TRUE(ready);
    ASSERT_EQ(ready->kind, FrameKind::ready);
    std::uint64_t serial = ready->serial;
    while (serial < static_cast<std::uint64_t>(i)) {
      const auto notification = peer.receive();
      ASSERT_TRUE(notification) << "notification " << i << " after ready " << ready->serial;
      ASSERT_EQ(notification->kind, FrameKind::notification);
      ASSERT_EQ(notification->serial, ++serial);
      EXPECT_EQ(notification->name, "com.example.changed");
      EXPECT_EQ(notification->value, PropertyValue::integer(static_cast<std::int64_t>(serial)));
    }
    ASSERT_LE(ready->serial, static_cast<std::uint64_t>(i - 1));
  }
  EXPECT_TRUE(eventually([&] { return descriptors_open() == open_before; }));
}

TEST_F(NotificationCenter, ASlowObserverIsToldHowManyItMissed) {
  SocketPeer slow = observer();
  SocketPeer rude = observer();
  static_cast<void>(rude.send(std::string(50'000, '?')));
  const PropertyValue object = text(std::string(1000, 'o'));
  constexpr std::uint64_t count = 10'000;
  for (std::uint64_t i = 1; i < count; ++i) {
    // One that has no name on the wire counts like the others.
    post_notification(i == count - 3 ? text("a\nb") : text("name"), object);
  }
  post_notification(text("last"), nullptr);
  for (SocketPeer* peer : {&slow, &rude}) {
    std::uint64_t serial = peer->receive()->serial;
    std::uint64_t missed = 0;
    while (serial < count) {
      const auto frame = peer->receive();
      ASSERT_TRUE(frame) << "after " << serial;
      if (frame->kind == FrameKind::missed) {
        missed += *frame->value.to_uint64();
        serial += *frame->value.to_uint64();
      } else {
        ++serial;
      }
      ASSERT_EQ(frame->serial, serial);
      EXPECT_EQ(frame->name == "last", serial == count);
    }
    EXPECT_GT(missed, 1000u);
  }
  SocketPeer late = observer();
  EXPECT_EQ(late.receive()->serial, count);
}

}  // namespace
}  // namespace quorvel::test
