// The simulator's socket: what observers are pushed, what commands are answered, and who is cut off.
#include <fcntl.h>
#include <sys/socket.h>

#include <fstream>

#include "linux/base/local_socket.h"
#include "platform/telephony.h"
#include "quorvel/client.h"
#include "support/program.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"
#include "wire/telephony_state.h"

namespace quorvel::test {

const std::string kSocket = "/run/quorvel/telvane.sock";

// A connection as the daemon makes one.
struct Observer : SocketPeer {
  Observer() : SocketPeer(connected_to("telvane.sock")) {}
  // The next frame's kind, name and value as one text; empty at the end of the connection.
  std::string next() {
    const auto frame = receive();
    if (!frame) return "";
    return (frame->kind == wire::FrameKind::state ? "state" : "event ") + frame->name + " " + described(frame->value);
  }
};

// The lines of a recording, each up to its time.
std::vector<std::string> without_times(const std::string& path) {
  std::vector<std::string> lines;
  std::ifstream file(path);
  for (std::string line; std::getline(file, line);) lines.push_back(line.substr(0, line.find(",\"time\"")));
  return lines;
}

class TelvaneSim : public testing::Test {
 protected:
  TelvaneSim() : simulator_(std::in_place, simulator_program()) {
    root.ignore_log();
    if (!simulator_->wait_for_output("ready")) throw std::runtime_error("the simulator does not start");
  }

  client::Reply call(std::string_view command, const PropertyValue& argument) {
    client::Options options;
    options.service = "telvane";
    options.timeout = std::chrono::minutes(1);
    return client::Client(options).call(command, argument);
  }

  ScratchRoot root;
  std::optional<Program> simulator_;
};

TEST(PassedSockets, AreServedWhereTheyCanBe) {
  ScratchRoot root;
  root.make_directory("/run/quorvel");
  const platform::host::ListeningSocket passed = platform::host::ListeningSocket::open("telvane.sock", 0600);
  ASSERT_EQ(::fcntl(passed.get(), F_SETFD, 0), 0);
  const std::string command = "exec 3</dev/null 4<&" + std::to_string(passed.get()) +
                              "; LISTEN_FDS=3 LISTEN_PID=$$ exec " + simulator_program();
  Program simulator("/bin/bash", {.arguments = {"-c", command}, .input = {}});
  EXPECT_EQ(Observer().next(), "state {}");
  EXPECT_EQ(simulator.stop().err,
            "telvane-sim: passed descriptors (LISTEN_FDS) that are not open: 1\n"
            "telvane-sim: passed descriptors (LISTEN_FDS) that are no local stream sockets: 1\n");
  EXPECT_TRUE(root.exists(kSocket)) << "its file is not the simulator's";
}

TEST_F(TelvaneSim, PushesItsStateAndTakesCommands) {
  Observer observer;
  EXPECT_EQ(observer.next(), "state {}");
  EXPECT_FALSE(call("set", dictionary({{"Field", "gid1"}, {"Value", array({1, "x"})}})).error);
  EXPECT_FALSE(call("fail", dictionary({{"Field", "gid1"}, {"Domain", 1}, {"Code", -5}})).error);
  EXPECT_FALSE(call("notify", dictionary({{"Name", "phone-number-changed"}, {"Count", 2}})).error);
  const std::string state = R"({"gid1": {"Code": -5, "Domain": 1, "Value": [1, "x"]}})";
  EXPECT_EQ(observer.next(), "event phone-number-changed " + state);
  EXPECT_EQ(observer.next(), "event phone-number-changed " + state);
  EXPECT_EQ(described(call("show", {}).value), state);
  EXPECT_FALSE(call("succeed", dictionary({{"Field", "gid1"}})).error);
  EXPECT_FALSE(call("set", dictionary({{"Field", "gid1"}})).error);
  EXPECT_EQ(described(call("show", {}).value), "{}");

  const std::pair<const char*, PropertyValue> refused[] = {
      {"dance", {}},
      {"set", {}},
      {"set", dictionary({{"Field", "colour"}, {"Value", 1}})},
      {"set", dictionary({{"Field", "connection"}, {"Value", 1}})},
      {"fail", dictionary({{"Field", "sim-status"}, {"Domain", 1}, {"Code", 1}})},
      {"fail", dictionary({{"Field", "imsi"}, {"Domain", 1}, {"Code", std::int64_t{1} << 31}})},
      {"notify", dictionary({{"Name", "sim-lost"}})},
      {"notify", dictionary({{"Name", "phone-number-changed"}, {"Count", -1}})},
  };
  for (const auto& [command, argument] : refused) {
    const client::Reply reply = call(command, argument);
    EXPECT_TRUE(reply.error && reply.error->code == client::ErrorCode::service_failure) << command;
  }
  Observer newcomer;
  for (const char* told : {"state {}", "event sim-status-changed {}", "event postponement-status-changed {}"}) {
    EXPECT_EQ(newcomer.next(), told);
  }
  for (const char* garbage : {"garbage that is no frame", "\0\0\0\0\2\0\0\0\0\0\0\0\0\0\0\1"}) {
    Observer hostile;
    hostile.send(std::string_view(garbage, 16));
    for (int frame = 0; frame < 3; ++frame) EXPECT_NE(hostile.next(), "");
    EXPECT_TRUE(hostile.is_closed());
  }
}

TEST_F(TelvaneSim, DeliversABurstInOrderAndCutsOffWhoDoesNotRead) {
  constexpr int kRounds = 50;
  constexpr int kBurst = 2000;
  ASSERT_FALSE(call("set", dictionary({{"Field", "gid2"}, {"Value", std::string(2000, 'x')}})).error);
  Observer observer;
  Observer asleep;
  std::thread commander([&] {
    for (int i = 0; i < kRounds; ++i) {
      EXPECT_FALSE(call("set", dictionary({{"Field", "gid1"}, {"Value", i}})).error);
      EXPECT_FALSE(call("notify", dictionary({{"Name", "sim-status-changed"}, {"Count", kBurst}})).error);
    }
  });
  EXPECT_TRUE(observer.next().starts_with("state"));
  for (int i = 0; i < kRounds * kBurst; ++i) {
    const std::string event = observer.next();
    const std::string expected = "\"gid1\": {\"Value\": " + std::to_string(i / kBurst) + "}";
    ASSERT_TRUE(event.starts_with("event sim-status-changed ")) << event;
    ASSERT_NE(event.find(expected), std::string::npos) << event.substr(0, 200);
  }
  commander.join();
  EXPECT_TRUE(asleep.next().starts_with("state"));
  while (!asleep.next().empty()) continue;
  char byte;
  EXPECT_EQ(::recv(asleep.descriptor(), &byte, 1, MSG_DONTWAIT), 0) << "it was not cut off";
}

TEST_F(TelvaneSim, PlaysWhatWasRecorded) {
  simulator_->stop();
  const std::string recording = root.outside() / "recording";
  const auto run = [&](std::vector<std::string> arguments) {
    simulator_.emplace(simulator_program(), ProgramOptions{.arguments = std::move(arguments), .input = {}});
  };
  const auto step = [](const char* second, const std::string& event, const char* iccid) {
    return (event.empty() ? "{" : "{\"event\":\"" + event + "\",") + "\"state\":{\"iccid\":{\"Value\":\"" + iccid +
           "\"}},\"time\":{\"$date\":\"2026-01-31T12:00:" + second + "Z\"}}\n";
  };
  std::ofstream(recording) << step("00", "", "1") << step("10", "sim-newly-inserted", "2")
                           << step("10", "phone-number-changed", "2") << step("20", "sim-status-changed", "3");
  run({"--replay", recording, "--speed", "50"});
  ASSERT_TRUE(simulator_->wait_for_output("ready"));
  const std::string again = root.outside() / "again";
  Program recorder(control_program(), {.arguments = {"sim", "record", again}, .input = {}});
  EXPECT_TRUE(simulator_->wait_for_output("played 4 steps"));
  EXPECT_TRUE(eventually([&] { return without_times(again).size() == 4; }));
  recorder.stop();
  // The same but for the times, which are fifty times closer.
  EXPECT_EQ(without_times(again), without_times(recording));
  for (const char* wrong : {"", "{}", "garbage", R"({"time":{"$date":"2026-01-31T12:00:00Z"},"state":1})"}) {
    std::ofstream(recording) << wrong;
    EXPECT_EQ(run_to_end(simulator_program(), {"--replay", recording}).status, 66) << wrong;
  }
  const Outcome outcome = run_to_end(simulator_program(), {"--speed", "0"});
  EXPECT_EQ(outcome.status, 64);
  EXPECT_EQ(outcome.err, "telvane-sim: --speed is \"0\", but takes a number from 0.001 to 1000000\n");
}

TEST_F(TelvaneSim, ReplacesADeadOnesSocketAndRespectsALiveOnes) {
  EXPECT_EQ(run_to_end(simulator_program(), {}).status, 69);
  EXPECT_EQ(root.mode_of(kSocket), 0600u);
  simulator_->send_signal(SIGKILL);
  simulator_->wait();
  EXPECT_TRUE(root.exists(kSocket));
  simulator_.emplace(simulator_program());
  ASSERT_TRUE(simulator_->wait_for_output("ready"));
  EXPECT_EQ(Observer().next(), "state {}");
  EXPECT_EQ(simulator_->stop().status, 0);
  EXPECT_FALSE(root.exists(kSocket));
  root.write_file(kSocket, "a file");
  EXPECT_EQ(run_to_end(simulator_program(), {}).status, 71);
  EXPECT_EQ(root.read_file(kSocket), "a file");
  EXPECT_EQ(run_to_end(simulator_program(), {"--root", root.path("/nowhere")}).status, 78);
  EXPECT_EQ(run_to_end(simulator_program(), {"surplus"}).status, 64);
}

}  // namespace quorvel::test
