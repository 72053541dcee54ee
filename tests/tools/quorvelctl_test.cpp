// quorvelctl as a person and a script use it: what it prints where, and how it ends.
#include <sys/resource.h>

#include <csignal>
#include <fstream>

#include "support/program.h"
#include "support/scratch_root.h"

namespace quorvel::test {

class Quorvelctl : public testing::Test {
 protected:
  Quorvelctl() { root.ignore_log(); }

  struct Expected {
    std::vector<std::string> words;
    int status;
    std::string out;
  };

  // Every call must end so, print exactly that, and tell a person something on standard error when it did not work.
  static void expect_calls(const std::vector<Expected>& calls) {
    for (const Expected& call : calls) {
      const Outcome outcome = run_to_end(control_program(), call.words);
      const std::string words = testing::PrintToString(call.words) + "\n" + outcome.err;
      EXPECT_EQ(outcome.status, call.status) << words;
      EXPECT_EQ(outcome.out, call.out) << words;
      EXPECT_TRUE(call.status == 0 || outcome.err.starts_with("quorvelctl: ")) << words;
    }
  }

  // Calls of words between single blanks, which end with this status and print nothing.
  static void expect_refusals(int status, const std::string& calls) {
    std::istringstream lines(calls);
    for (std::string line, word; std::getline(lines, line, ';');) {
      Expected call{{}, status, ""};
      for (std::istringstream words(line); std::getline(words, word, ' ');) call.words.push_back(word);
      expect_calls({call});
    }
  }

  ScratchRoot root;
};

TEST_F(Quorvelctl, EndsAsPromisedWithoutAnybodyToTalkTo) {
  expect_refusals(2, "frobnicate;ark;ark get;ark get Key surplus;--root  preferences list com.example;" +
                         ("--root " + root.path("/nowhere").string()) +
                         " ark list;sim set iccid text;sim set colour 1;" +
                         "sim fail imsi 1 4294967296;sim notify sim-lost;sim insert --iccid 1;" +
                         "preferences set ../../escape Key 1;preferences set com.example Key null");
  expect_refusals(3, "regulatory-images;monitor;sim show;log;ark list;plist show /nothing.plist");
  expect_calls({
      {{}, 2, ""},
      {{"preferences", "list", "com.example", "--json"}, 1, "null\n"},
      {{"preferences", "delete", "com.example", "Key"}, 1, ""},
  });
  EXPECT_EQ(run_to_end(control_program(), {"--help"}).status, 0);
  EXPECT_EQ(run_to_end(control_program(), {"sim", "insert", "--help"}).status, 0);
}

TEST_F(Quorvelctl, ReadsTheSavedArkAsTheDaemonWould) {
  root.make_directory(kStateDirectory, 0700);
  expect_calls({{{"ark", "list", "--json"}, 0, "{}\n"}, {{"ark", "get", "Key", "--json"}, 1, "null\n"}});
  root.write_plist(kDataFile, dictionary({{"-Key", 5}, {"a-b-c", "x"}, {"a-", true}, {"-ProductVersion", "stored"}}));
  root.write_plist("/etc/quorvel/device_information.plist", dictionary({{"ProductVersion", "2.5"}}));
  expect_calls({
      {{"ark", "list", "--json"}, 0, "{\n  \"Key\": 5,\n  \"ProductVersion\": \"stored\"\n}\n"},
      {{"ark", "list", "--domain", "a", "--json"}, 0, "{\n  \"\": true,\n  \"b-c\": \"x\"\n}\n"},
      {{"ark", "list", "--domain", "none", "--json"}, 0, "{}\n"},
      {{"ark", "list", "--domains"}, 0, "\"\"\na\n"},
      {{"ark", "list", "--all"},
       0,
       "\"\":\n  Key:            5\n  ProductVersion: stored\na:\n  \"\":  true\n  b-c: x\n"},
      {{"ark", "list", "--all", "--domains"}, 2, ""},
      {{"ark", "get", "--raw", "--domain", "a", "b-c"}, 0, "x\n"},
      {{"ark", "get", "Key"}, 0, "5\n"},
      {{"ark", "get", "--domain", "a-b", "c", "--json"}, 0, "\"x\"\n"},
      {{"ark", "get", "ProductVersion", "--json"}, 0, "\"2.5\"\n"},
      {{"ark", "get", "--domain", "com.Orvane.mobile.internal", "DiagData"}, 1, ""},
  });
  root.write_file("/etc/quorvel/device_information.plist", "garbage");
  expect_calls({{{"ark", "get", "UniqueDeviceID"}, 3, ""}});
  root.write_file(kDataFile, "bplist00");
  expect_calls({{{"ark", "list"}, 3, ""}});
}

TEST_F(Quorvelctl, ShowsTheFactsAndWhereTheyComeFrom) {
  const char* const file = "/etc/quorvel/device_information.plist";
  root.write_file("/sys/class/power_supply/BAT0/type", "Battery");
  root.write_file("/sys/class/power_supply/BAT0/capacity", "57");
  root.make_directory("/run/quorvel");
  root.write_plist(file, dictionary({{"SerialNumber", "x\033[2J"}, {"marketing-name", std::string(70, 'n')}}));
  const std::string from = std::string(", ") + file + "\n", indent(26, ' ');
  expect_calls({
      {{"facts", "SerialNumber", "BatteryCurrentCapacity", "MarketingName"},
       0,
       "Without a domain\n  SerialNumber            x\\x1b[2J\n" + indent + "text" + from +
           "  MarketingName           " + std::string(70, 'n') + "\n" + indent + "text" + from +
           "\ncom.Orvane.mobile.battery\n  BatteryCurrentCapacity  57 percent\n" + indent +
           "integer, /sys/class/power_supply\n"},
      {{"facts", "--json", "SerialNumber", "BatteryCurrentCapacity"},
       0,
       "[\n  {\n    \"key\": \"SerialNumber\",\n    \"kind\": \"text\",\n    \"origin\": \"" + std::string(file) +
           "\",\n    \"value\": \"x\\u001b[2J\"\n  },\n  {\n    \"domain\": \"com.Orvane.mobile.battery\",\n"
           "    \"key\": \"BatteryCurrentCapacity\",\n    \"kind\": \"integer\",\n"
           "    \"origin\": \"/sys/class/power_supply\",\n    \"unit\": \"percent\",\n    \"value\": 57\n  }\n]\n"},
      {{"facts", "DiagData"}, 1, "com.Orvane.mobile.internal\n  DiagData  (no answer)\n"},
      {{"facts", "Nonsense"}, 2, ""},
      {{"facts", "--watch", "0"}, 2, ""},
  });
  Program watching(control_program(), {.arguments = {"facts", "--watch", "1", "BatteryCurrentCapacity"}, .input = {}});
  ASSERT_TRUE(watching.wait_for_output("57 percent"));
  root.write_plist(file, dictionary({{"BatteryCurrentCapacity", 79}}));
  EXPECT_TRUE(watching.wait_for_output("Z  BatteryCurrentCapacity  79 percent\n"));
  EXPECT_EQ(watching.stop().status, 0);
  // A simulator that stands still holds up nobody.
  Program simulator(simulator_program());
  ASSERT_TRUE(simulator.wait_for_output("ready"));
  EXPECT_EQ(run_to_end(control_program(), {"sim", "set", "firmware-version", "\"1.2\""}).status, 0);
  expect_calls({{{"ark", "get", "BasebandVersion"}, 0, "1.2\n"}});
  simulator.send_signal(SIGSTOP);
  expect_calls({{{"ark", "get", "BasebandVersion"}, 1, ""}});
  simulator.send_signal(SIGCONT);
}

TEST_F(Quorvelctl, ChangesPreferencesWholeAndKeepsTheRest) {
  const std::string path = "/private/var/mobile/Library/Preferences/com.example.plist";
  root.remove("/private/var/mobile/Library");
  expect_calls({
      {{"preferences", "set", "com.example", "Number", "-5"}, 0, ""},
      {{"preferences", "set", "com.example", "List", "[1,{}]"}, 0, ""},
      {{"preferences", "get", "com.example", "Number"}, 0, "-5\n"},
      {{"preferences", "get", "com.example", "Absent", "--json"}, 1, "null\n"},
  });
  root.set_mode(path, 0640);
  std::vector<std::thread> writers;
  for (int i = 0; i < 8; ++i) {
    writers.emplace_back([i] {
      EXPECT_EQ(run_to_end(control_program(), {"preferences", "set", "com.example", std::to_string(i), "true"}).status,
                0);
    });
  }
  for (std::thread& writer : writers) writer.join();
  EXPECT_EQ(root.read_plist(path).size(), 10u);
  EXPECT_EQ(root.mode_of(path), 0640u);
  expect_calls({{{"preferences", "delete", "com.example", "List"}, 0, ""}});
  EXPECT_EQ(root.read_plist(path).size(), 9u);
  root.write_file(path, "garbage");
  expect_calls({{{"preferences", "set", "com.example", "Number", "1"}, 3, ""}});
  EXPECT_EQ(root.read_file(path), "garbage");
}

TEST_F(Quorvelctl, WritesPropertyListsThatItShows) {
  const std::string path = root.path("/etc/file.plist");
  root.write_file("/etc/file.plist", "old");
  root.set_mode("/etc/file.plist", 0600);
  const std::string json = "{\n  \"A\": {\n    \"$data\": \"AAEC\"\n  },\n  \"B\": 2.0\n}\n";
  const Outcome replaced = run_to_end(control_program(), {"plist", "write", path}, json);
  EXPECT_EQ(std::pair(replaced.status, replaced.err), std::pair(0, std::string()));
  EXPECT_EQ(root.mode_of("/etc/file.plist"), 0600u);
  expect_calls({{{"plist", "show", path, "--json"}, 0, json}});
  const Outcome written = run_to_end(control_program(), {"plist", "write", "-"}, json);
  EXPECT_EQ(written.out, root.read_file("/etc/file.plist"));
  for (const char* wrong : {"", "null", "{", "{\"$data\": 1}"})
    EXPECT_EQ(run_to_end(control_program(), {"plist", "write", path}, wrong).status, 2) << wrong;
  EXPECT_EQ(written.out, root.read_file("/etc/file.plist"));
  EXPECT_EQ(run_to_end(control_program(), {"plist", "show", "/nothing"}).err,
            "quorvelctl: cannot open /nothing: No such file or directory\n");
}

// A disk that takes no more is played by a limit on the size of files, which programs inherit.
TEST_F(Quorvelctl, LeavesNothingBehindWhenAFileCannotBeWritten) {
  const std::string folder = "/private/var/mobile/Library/Preferences";
  root.write_plist(folder + "/com.example.plist", dictionary({}));
  const std::string file = root.path(folder + "/com.example.plist");
  const rlimit little = {64, RLIM_INFINITY};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &little), 0);
  const std::string large = "[0,1,2,3,4,5,6,7,8,9]";  // larger as a property list
  const Outcome written = run_to_end(control_program(), {"plist", "write", file}, large);
  const Outcome set = run_to_end(control_program(), {"preferences", "set", "com.example", "Key", large});
  const rlimit any = {RLIM_INFINITY, RLIM_INFINITY};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &any), 0);
  for (const Outcome& outcome : {written, set}) {
    EXPECT_EQ(outcome.status, 3);
    EXPECT_TRUE(outcome.err.starts_with("quorvelctl: cannot write ")) << outcome.err;
  }
  const std::filesystem::directory_iterator entries(root.path(folder)), end;
  EXPECT_EQ(std::distance(entries, end), 1);
  EXPECT_EQ(root.read_plist(folder + "/com.example.plist"), dictionary({}));
}

TEST_F(Quorvelctl, MakesADeviceRootThatTheDaemonServes) {
  const std::string made = root.outside() / "made" / "device";
  const std::string sample = made + "/etc/quorvel/device_information.plist";
  EXPECT_EQ(run_to_end(control_program(), {"root", "create", made}).status, 0);
  EXPECT_TRUE(std::filesystem::exists(made + "/etc/quorvel/telephony"));
  EXPECT_EQ(std::filesystem::status(made + "/private/var/mobile/Library/qvd").permissions(),
            std::filesystem::perms::owner_all);
  std::ofstream(sample) << "the user's own";
  EXPECT_EQ(run_to_end(control_program(), {"root", "create", made}).status, 0);
  EXPECT_EQ(std::filesystem::file_size(sample), 14u);
  // Everything is checked before anything is made.
  const std::string foreign = root.outside() / "foreign";
  std::filesystem::create_directories(foreign + "/var");
  EXPECT_EQ(run_to_end(control_program(), {"root", "create", foreign}).status, 3);
  std::filesystem::rename(foreign + "/var", foreign + "/run");
  std::filesystem::create_symlink("elsewhere", foreign + "/var");
  EXPECT_EQ(run_to_end(control_program(), {"root", "create", foreign}).status, 3);
  std::filesystem::remove(foreign + "/var");
  std::ofstream(foreign + "/etc") << "a file";
  EXPECT_EQ(run_to_end(control_program(), {"root", "create", foreign}).status, 3);
  EXPECT_FALSE(std::filesystem::exists(foreign + "/private"));
  EXPECT_EQ(run_to_end(control_program(), {"root", "create", "//"}).status, 2);
  EXPECT_EQ(std::filesystem::read_symlink(made + "/var"), "private/var");
  Program simulator(simulator_program(), {.input = {}, .environment = {{"QUORVEL_ROOT", made}}});
  ASSERT_TRUE(simulator.wait_for_output("ready"));
  Program daemon(daemon_program(), {.input = {}, .environment = {{"QUORVEL_ROOT", made}}});
  ASSERT_TRUE(daemon.wait_until_ready());
  Program monitor(control_program(), {.arguments = {"--root", made, "monitor", "--json"}, .input = {}});
  Program reader(control_program(), {.arguments = {"--root", made, "monitor", "--count", "3"}, .input = {}});
  for (const Program* observer : {&monitor, &reader}) {
    ASSERT_TRUE(eventually([&] { return observer->err().find("listening") != std::string::npos; }));
  }
  const auto call = [&](std::vector<std::string> words) {
    words.insert(words.begin(), {"--root", made});
    return run_to_end(control_program(), words);
  };
  EXPECT_NE(call({"regulatory-images", "--json"}).out.find("\"Mark\": \"CE\""), std::string::npos);
  EXPECT_EQ(call({"sim", "insert", "--iccid", "89", "--imsi", "23"}).status, 0);
  EXPECT_TRUE(monitor.wait_for_output("\"sequence\":3"));
  EXPECT_TRUE(reader.wait_for_output("  #3  com.Orvane.mobile.halvard.phone_number_changed\n"));
  EXPECT_TRUE(call({"sim", "set", "gid1", "7"}).err.starts_with("quorvelctl: a number is set, which"));
  EXPECT_EQ(call({"sim", "set", "postponement", "7"}).err, "");
  EXPECT_EQ(call({"sim", "clear", "postponement"}).status, 0);
  EXPECT_EQ(call({"sim", "fail", "gid1", "1", "-5"}).status, 0);
  EXPECT_EQ(call({"sim", "show"}).out,
            "sim-status          \"Ready\"\niccid               \"89\"\nimsi                \"23\"\n"
            "firmware-version    (nothing)\nbootloader-version  (nothing)\ngid1                7  fails with 1.-5\n"
            "gid2                (nothing)\npostponement        (nothing)\nconnection          succeeds\n");
  EXPECT_EQ(call({"sim", "clear", "gid1"}).status, 0);
  EXPECT_EQ(call({"sim", "succeed", "gid1"}).status, 0);
  EXPECT_EQ(call({"sim", "eject"}).status, 0);
  EXPECT_TRUE(monitor.wait_for_output("\"sequence\":4"));
  EXPECT_EQ(call({"sim", "show", "--json"}).out,
            "{\n  \"iccid\": {\n    \"Value\": \"\"\n  },\n  \"imsi\": {\n    \"Value\": \"\"\n  },\n"
            "  \"sim-status\": {\n    \"Value\": \"NotInserted\"\n  }\n}\n");
  EXPECT_EQ(call({"sim", "set", "connection", "1"}).status, 2);
  EXPECT_TRUE(eventually([&] { return call({"log"}).out.find("The IMSI has been removed") != std::string::npos; }));
  EXPECT_EQ(monitor.stop().status, 0);
  EXPECT_EQ(simulator.stop().status, 0);
  std::filesystem::remove(made + "/private/var/mobile/Library/qvd/regulatory_images/regulatory_images.plist");
  const Outcome none = call({"regulatory-images", "--json"});
  EXPECT_EQ(none.status, 1);
  EXPECT_EQ(none.out, "null\n");
}

TEST_F(Quorvelctl, TellsHowTheDaemonIs) {
  const auto expect_status = [](int status, const std::string& part) {
    const Outcome outcome = run_to_end(control_program(), {"status"});
    EXPECT_EQ(outcome.status, status) << outcome.out << outcome.err;
    EXPECT_NE(outcome.out.find(part), std::string::npos) << outcome.out;
    const std::string json = run_to_end(control_program(), {"status", "--json"}).out;
    EXPECT_TRUE(json.ends_with(status == 0 ? "  \"well\": true\n}\n" : "  \"well\": false\n}\n")) << json;
    EXPECT_EQ(json.find("\"reason\": ") == std::string::npos, status == 0) << json;
  };
  expect_status(3, "daemon     not running. Start quorveld");
  Program early(daemon_program());
  ASSERT_TRUE(early.wait_until_ready());
  root.write_file("/etc/quorvel/telephony", "");
  Program simulator(simulator_program());
  ASSERT_TRUE(simulator.wait_for_output("ready"));
  expect_status(1, "not followed: the daemon may have started before /etc/quorvel/telephony was made");
  early.stop();
  Program daemon(daemon_program());
  ASSERT_TRUE(daemon.wait_until_ready());
  EXPECT_TRUE(eventually([] { return run_to_end(control_program(), {"status"}).status == 0; }));
  expect_status(0, "telephony  followed\n           served by telvane-sim, process " + std::to_string(simulator.pid()));
  expect_status(0, "daemon     running, quorveld, process " + std::to_string(daemon.pid()));
  simulator.stop();
  EXPECT_TRUE(eventually([] { return run_to_end(control_program(), {"status"}).status == 1; }));
  expect_status(1, "telephony  not followed: nothing is at /run/quorvel/telvane.sock");
  root.write_file(kDataFile, "garbage");
  expect_status(1, "does not hold a binary property list");
}

TEST_F(Quorvelctl, FollowsTheLogThroughRotations) {
  const std::string previous = std::string(kLogFile) + ".1";
  root.write_file(previous, "one\n");
  root.write_file(kLogFile, "two\n");
  expect_calls({{{"log"}, 0, "one\ntwo\n"}, {{"log", "--json"}, 0, "[\n  \"one\",\n  \"two\"\n]\n"}});
  root.write_file(kLogFile, "two\033]0;\n");
  expect_calls({{{"log", "-n", "1"}, 0, "two\\x1b]0;\n"}, {{"log", "-n", "0", "--json"}, 0, "[]\n"}});
  root.write_file(kLogFile, "two\n");
  Program follower(control_program(), {.arguments = {"log", "--follow"}, .input = {}});
  ASSERT_TRUE(follower.wait_for_output("two\n"));
  std::filesystem::rename(root.path(kLogFile), root.path(previous));
  root.write_file(kLogFile, "three\n");
  EXPECT_TRUE(follower.wait_for_output("three\n"));
  // Two rotations that the follower meets as one.
  follower.send_signal(SIGSTOP);
  for (const char* line : {"four\n", "five\n"}) {
    std::filesystem::rename(root.path(kLogFile), root.path(previous));
    root.write_file(kLogFile, line);
  }
  follower.send_signal(SIGCONT);
  EXPECT_TRUE(follower.wait_for_output("five\n"));
  // Taken away and made anew, which brings nothing back.
  root.remove(kLogFile);
  root.write_file(kLogFile, "anew\n");
  EXPECT_TRUE(follower.wait_for_output("anew\n"));
  // Cut in place within a line, and grown again beyond the place where the follower stood.
  root.write_file(kLogFile, "five\nsix is not whole");
  const std::string longer = "seven is longer than all that stood there before\n";
  EXPECT_TRUE(eventually([&] { return follower.out().ends_with("five\n"); }));
  std::this_thread::sleep_for(std::chrono::milliseconds(300));
  root.write_file(kLogFile, longer);
  EXPECT_TRUE(follower.wait_for_output("before\n"));
  const Outcome outcome = follower.stop();
  EXPECT_EQ(outcome.out, "one\ntwo\nthree\nfour\nfive\nanew\nfive\nsix is not whole\n" + longer);
  EXPECT_EQ(outcome.status, 0);
}

}  // namespace quorvel::test
