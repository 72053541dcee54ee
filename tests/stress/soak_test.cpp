// Everything the daemon does in its life, over and over: nothing may pile up.
#include "quorvel/observer.h"
#include "stress/stressed_daemon.h"

namespace quorvel::test {

struct Work {
  long requests, notifications, sim_changes, rotations;
};

std::string counts(const Work& work) {
  std::string text = std::to_string(work.requests);
  for (const long count : {work.notifications, work.sim_changes, work.rotations}) text += ", " + std::to_string(count);
  return text;
}

class SoakTest : public StressedDaemon {
 protected:
  SoakTest() {
    options_.service = "telvane";
    if (!simulator_.wait_until_ready()) throw std::runtime_error("no simulator");
    provision_images(1024);
    start();
    if (observer_.connect()) throw std::runtime_error("no notification center");
    requester_ = connected();
  }

  // One request in 256 comes from a client of its own; the others follow each other on one connection.
  void request(long count) {
    for (long i = 0; i < count; ++i) {
      ASSERT_TRUE(requester_.send(image_call(++serial_)));
      const auto reply = requester_.receive();
      ASSERT_TRUE(reply);
      ASSERT_EQ(reply->serial, serial_);
      done_.requests += 1;
    }
    static_cast<void>(well_behaved_call());
    done_.requests += 1;
  }
  // What the log says of images that are not there tells the mode of their folder: another one, so that it is no line
  // that is left out as a repeated one.
  void request_that_logs() {
    root.set_mode(std::string(kStateDirectory) + "/regulatory_images", 0700 | (++modes_ & 077));
    request(1);
  }
  // Until the log has been rotated so often.
  void rotate(long count) {
    remove_images();
    while (count > 0) {
      const ino_t before = log_file();
      request_that_logs();
      if (log_file() != before) {
        --count;
        ++done_.rotations;
      }
    }
    provision_images(1024);
  }
  void notify(long count) {
    constexpr long kAtOnce = 500;  // the center keeps twice as many for an observer that is held up
    for (; count > 0; count -= kAtOnce) {
      tell("notify", dictionary({{"Name", "phone-number-changed"}, {"Count", std::min(count, kAtOnce)}}));
      expect_notifications(std::min(count, kAtOnce));
    }
  }
  // A card goes, or another one comes: two notifications for the one that comes.
  void change_sim() {
    const bool inserted = ++cards_ % 2 == 0;
    tell("set", dictionary({{"Field", "sim-status"}, {"Value", inserted ? "Ready" : "NotInserted"}}));
    tell("set", dictionary({{"Field", "iccid"}, {"Value", "8944" + std::to_string(cards_)}}));
    tell("set", dictionary({{"Field", "imsi"}, {"Value", inserted ? std::to_string(cards_) : ""}}));
    tell("notify", dictionary({{"Name", inserted ? "sim-newly-inserted" : "sim-status-changed"}}));
    expect_notifications(inserted ? 2 : 1);
    ++done_.sim_changes;
  }

  static constexpr long kRounds = 10;
  static long share(long whole, long round) { return (round + 1) * whole / kRounds - round * whole / kRounds; }
  void do_all(const Work& work) {
    for (long round = 0; round < kRounds; ++round) {
      notify(share(work.notifications, round));
      for (long i = share(work.sim_changes, round); i > 0; --i) change_sim();
      rotate(share(work.rotations, round));
      while (done_.requests < (round + 1) * work.requests / kRounds) request(255);
      if (HasFatalFailure()) return;
    }
  }

  // The log is closed by a rotation until the next line, so a line goes first.
  [[nodiscard]] std::size_t descriptors_after_a_line() {
    remove_images();
    request_that_logs();
    provision_images(1024);
    return settled_descriptors();
  }

  Work done_ = {};

 private:
  [[nodiscard]] ino_t log_file() const {
    struct stat status {};
    ::stat(root.path(kLogFile).c_str(), &status);
    return status.st_ino;
  }
  void tell(std::string_view command, const PropertyValue& argument) {
    const client::Reply reply = client::Client(options_).call(command, argument);
    ASSERT_FALSE(reply.error) << reply.error->description;
  }
  void expect_notifications(long count) {
    client::Event event;
    for (long i = 0; i < count; ++i) {
      ASSERT_FALSE(observer_.next(event, kPatience));
      ASSERT_EQ(event.missed, 0u);
      done_.notifications += 1;
    }
  }

  Program simulator_{simulator_program()};
  client::Options options_;
  client::Observer observer_;
  SocketPeer requester_{Descriptor()};
  std::uint64_t serial_ = 0;
  long cards_ = 0;
  mode_t modes_ = 0;
};

TEST_F(SoakTest, MemoryAndDescriptorsStayFlat) {
  do_all({2000, 1000, 20, 2});
  const Work warm_up = done_;
  const long memory_before = resident_kib(pid());
  const std::size_t descriptors_before = descriptors_after_a_line();
  done_ = {};
  const Work wanted = {quick_or_long(20'000, 1'000'000), quick_or_long(2'000, 100'000), quick_or_long(50, 1'000),
                       quick_or_long(2, 50)};
  do_all(wanted);
  ASSERT_GT(warm_up.rotations, 0);
  const double grown = static_cast<double>(resident_kib(pid()) - memory_before) / 1024;
  const std::size_t descriptors = descriptors_after_a_line();
  tell_figure("soak: requests, notifications, SIM changes, rotations", counts(wanted), counts(done_),
              done_.requests >= wanted.requests && done_.notifications >= wanted.notifications &&
                  done_.sim_changes >= wanted.sim_changes && done_.rotations >= wanted.rotations);
  tell_figure("soak: memory", "within 1 MiB", written(grown, "MiB"), grown <= 1);
  tell_figure("soak: descriptors", "flat",
              std::to_string(descriptors_before) + " before, " + std::to_string(descriptors) + " after",
              descriptors == descriptors_before);
  expect_quick_end("after the soak");
}

}  // namespace quorvel::test
