// Every allocation of every operation fails in turn, once and from then on. Nothing may die but make_mutable, nothing
// may leak, and what fails says so and changes nothing. Each attempt runs in a process of its own.
#include <sys/mman.h>
#include <sys/wait.h>

#include <iostream>

#include "core/quorvel_daemon.h"
#include "device/baseband_info.h"
#include "device/device_type.h"
#include "files/property_list_file.h"
#include "files/value_helpers.h"
#include "hardening/allocations.h"
#include "linux/notifications/notification_server.h"
#include "log/daemon_log.h"
#include "platform/telephony.h"
#include "property/binary/binary.h"
#include "protocol/quorvel_protocol.h"
#include "store/data_ark_record.h"
#include "store/key_names.h"
#include "store/live_answers.h"
#include "support/figures.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"
#include "wire/telephony_state.h"

namespace quorvel::test {

using allocations::Fault;

constexpr const char* kPlist = "/private/var/mobile/file.plist";
constexpr StaticText kMarked = "marked";
constexpr const char* kSetAside = "/private/var/mobile/Library/qvd/data_ark.plist.unreadable";
constexpr const char* kDying = "make_mutable: Could not create mutable copy! We are dead!";
// An array and, before it, the text that is its only element, in UTF-16.
const std::string kBackwards = std::string("bplist00\x61\0\xe4\xa1\1\x0b\x08\0\0\0\0\0\0\1\1", 23) +
                               std::string("\0\0\0\0\0\0\0\2\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x0d", 24);
const std::string kLong(300, 'k'), kOwn(9999, 'o');

ScratchRoot* root = nullptr;
Descriptor telephony;  // the listening socket of the service that the test plays

// Something of everything: containers met again, a leaf of its own memory, a text beyond ASCII, an index.
PropertyValue document() {
  PropertyValue result = dictionary({{kLong, text(kOwn)}, {"\xc3\xa4", test::data("bytes")}});
  const PropertyValue shared = array({1.5, -1});
  for (int i = 0; i < 9; ++i) {
    const PropertyValue twice = array({shared, dictionary({})});
    EXPECT_TRUE(result.set(text(std::to_string(i)), array({twice, twice})));
  }
  return result;
}

PropertyValue entries(std::string_view prefix, int count) {
  PropertyValue result = PropertyValue::dictionary();
  for (int i = 0; i < count; ++i) EXPECT_TRUE(result.set(text(std::string(prefix) + std::to_string(i)), text("value")));
  return result;
}

// What operations work on. Containers come once as nobody else's and once held by somebody, who must see no change.
struct Things {
  const PropertyValue key = text(kLong), domain = text("domain");
  PropertyValue table = entries("", 8), list = array({1, 2, 3, 4}), bytes = test::data("bytes").mutable_copy();
  PropertyValue held_table = entries("", 20), held_list = array({1, 2, 3, 4}), held_bytes = bytes.mutable_copy();
  const PropertyValue holders[3] = {held_table, held_list, held_bytes};
  const PropertyValue value = document(), equal = document();
  const std::string file = encoded(value);
  const std::string data_path = root->path(kDataFile).string();
  ByteBuffer out;
  std::unique_ptr<DataArk> ark, loaded;
  const std::unique_ptr<DataArk> empty_ark = std::make_unique<DataArk>();
  platform::IpcListener* listener = nullptr;
  QuorvelDaemon daemon;

  Things() {
    root->write_plist(kDataFile, entries("domain-", 20));
    ark.reset(data_ark_load());
    EXPECT_EQ(data_ark_set(ark.get(), key, key, key), 0);
    EXPECT_EQ(data_ark_add_to_class(ark.get(), domain, {}, 3), 0);
    EXPECT_EQ(data_ark_add_to_class(ark.get(), domain, kMarked, 5), 0);
    EXPECT_EQ(data_ark_add_to_class(ark.get(), domain, text("0"), 1), 0);
    EXPECT_EQ(data_ark_register_notification(ark.get(), domain, {}, text("name"), kEventSet), 0);
    root->write_file(kPlist, file);
    root->write_plist(kDataFile, entries("old", 20));
    root->remove(kSetAside);
    EXPECT_TRUE(out.append("before"));
  }

  [[nodiscard]] static std::string state_of(DataArk& ark) {
    const LockHold hold(ark.lock);
    std::string all = described(ark.values) + std::to_string(ark.change_count);
    all += ark.class_marks.size() > 0 ? described(ark.class_marks) : "";
    for (const PropertyValue& names : ark.registries) all += names.size() > 0 ? described(names) : "";
    return all;
  }
  [[nodiscard]] std::string state() const {
    return described(array({table, list, bytes, held_table, held_list, held_bytes, value})) + state_of(*ark) +
           state_of(*empty_ark) + root->read_file(kPlist) + root->read_file(kDataFile) +
           std::string(reinterpret_cast<const char*>(out.data()), out.size());
  }
  [[nodiscard]] bool data_file_changed() const {
    struct stat status {};
    return ::stat(data_path.c_str(), &status) != 0 || status.st_size != 282;
  }
  [[nodiscard]] std::span<const std::byte> file_bytes() const { return std::as_bytes(std::span(file)); }
};

bool all(const auto&... values) { return (static_cast<bool>(values) && ...); }

// Plays the telephony service: an event that stands ready when the center's run loop starts.
void send_event(Things&) {
  platform::TelephonyCenter* center = platform::default_telephony_center();
  platform::bind_to_run_loop(center, platform::main_run_loop(), platform::RunLoopMode::default_mode);
  static SocketPeer peer = accept_from(telephony);
  const PropertyValue info = dictionary({{"Status", "Ready"}, {"Carrier", "Sample"}, {"Bands", array({1, 2})}});
  PropertyValue state = PropertyValue::dictionary();
  for (const auto field : wire::kStateFields) {
    const bool is_info = field == wire::kPostponementField.text();
    EXPECT_TRUE(state.set(field, dictionary({{"Value", is_info ? Value(info) : Value(field)}})));
  }
  EXPECT_TRUE(peer.send(frame_bytes(wire::FrameKind::event, 0, "sim-status-changed", state)));
  ::raise(SIGTERM);  // ends the loop behind what stands there already
}

bool serve_event(Things&) { return platform::run_main_run_loop(), static_cast<bool>(platform::copy_sim_status()); }

void deliver_event(Things& t) {
  static const bool delivered = (send_event(t), serve_event(t));
  EXPECT_TRUE(delivered);
}

// A load that failed is followed by a save: what was in the file must not be lost.
void save_loaded(Things& t) {
  if (!t.loaded) return;
  EXPECT_EQ(data_ark_set(t.loaded.get(), text("new"), {}, text("new")), 0);
  data_ark_store(t.loaded.get());
  EXPECT_EQ(root->read_plist(root->exists(kSetAside) ? kSetAside : kDataFile).get(std::string_view("old7")),
            text("value"));
}

bool is_answered(SocketPeer& peer) {
  if (!peer.send(frame_bytes(wire::FrameKind::call, 7, protocol::kCopyRegulatoryImages))) return false;
  const auto reply = peer.receive();
  EXPECT_TRUE(reply || peer.is_closed(std::chrono::seconds(0))) << "hangs";
  return reply && reply->value.size() == 20;
}

SocketPeer connected_client() { return SocketPeer::connected_to(std::string(protocol::kServiceName) + ".sock"); }

// The service's own threads fail; its client is answered or cut off, and the next one is served. Every thread is known
// to run before one fails, as each serves some of several clients.
void start_service(Things& t) {
  allocations::spare_this_thread();
  t.listener = platform::create_listener(protocol::kServiceName);
  platform::set_delegate(t.listener, {&t.daemon, &QuorvelDaemon::accept});
  EXPECT_EQ(platform::resume(t.listener), 0);
  std::vector<SocketPeer> clients;
  for (int i = 0; i < 8; ++i) clients.push_back(connected_client());
  for (SocketPeer& client : clients) EXPECT_TRUE(is_answered(client));
}

bool ask_service(Things&) {
  SocketPeer client = connected_client();
  return is_answered(client);
}

void end_service(Things& t) {
  EXPECT_TRUE(ask_service(t));
  platform::release_listener(t.listener);
}

enum class Kind { ordinary, once_only, in_steps, may_die };  // in steps: those before the failed one stay done

struct Case {
  const char* name;
  bool (*operation)(Things&);  // whether it did what it is for: it must when no allocation failed
  long kept = 0;               // blocks that live on: notifications posted, the telephony state
  Kind kind = Kind::ordinary;
  void (*before)(Things&) = nullptr;
  void (*behind)(Things&) = nullptr;
};

const Case kCases[] = {
    {"integer",
     [](Things&) { return all(PropertyValue::integer(INT64_MIN), PropertyValue::unsigned_integer(UINT64_MAX)); }},
    {"real", [](Things&) { return all(PropertyValue::real(1), PropertyValue::date(1), PropertyValue::data({})); }},
    {"string", [](Things&) { return all(PropertyValue::string("a"), PropertyValue::joined_string("a", "b")); }},
    {"containers", [](Things&) { return all(PropertyValue::array(3), PropertyValue::dictionary(3)); }},
    {"set", [](Things& t) { return t.table.set(t.key, t.key); }},
    {"set, held", [](Things& t) { return t.held_table.set(t.key, t.key); }},
    {"slot, held", [](Things& t) { return t.held_table.slot(std::string_view("7")) != nullptr; }},
    {"remove, held", [](Things& t) { return all(t.held_table.remove(std::string_view("7"))); }},
    {"append", [](Things& t) { return t.list.append(t.key); }},
    {"append, held", [](Things& t) { return t.held_list.append(t.key); }},
    {"slot of an array, held", [](Things& t) { return t.held_list.slot(std::size_t{1}) != nullptr; }},
    {"mutable_bytes, held", [](Things& t) { return !t.held_bytes.mutable_bytes().empty(); }},
    {"mutable_copy",
     [](Things& t) { return all(t.value.mutable_copy(), t.list.mutable_copy(), t.bytes.mutable_copy()); }},
    {"make_mutable", [](Things& t) { return make_mutable(t.table) == t.table; }, 0, Kind::may_die},
    {"read_binary", [](Things& t) { return read_binary(t.file_bytes(), Mutability::immutable) == t.value; }},
    {"read_binary, backwards",
     [](Things&) { return read_binary(std::as_bytes(std::span(kBackwards)), Mutability::immutable).size() == 1; }},
    {"write_binary", [](Things& t) { return write_binary(t.value, t.out); }},
    {"comparing", [](Things& t) { return t.value == t.equal; }},
    {"store_dict", [](Things& t) { return store_dict(kPlist, t.table) == 0; }},
    {"load_dict", [](Things&) { return all(load_dict(kPlist)); }},
    {"load_mutable_dict", [](Things&) { return all(load_mutable_dict(kPlist)); }},
    {"data_ark_load", [](Things& t) { return t.loaded.reset(data_ark_load()), t.loaded != nullptr; }, 0, Kind::ordinary,
     nullptr, save_loaded},
    {"data_ark_store", [](Things& t) { return data_ark_store(t.ark.get()), t.data_file_changed(); }},
    {"data_ark_set", [](Things& t) { return data_ark_set(t.ark.get(), t.domain, t.key, t.key) == 0; }, 2},
    {"data_ark_set, a marked key", [](Things& t) { return data_ark_set(t.ark.get(), t.domain, kMarked, t.key) == 0; },
     2},
    {"data_ark_set, the first", [](Things& t) { return data_ark_set(t.empty_ark.get(), {}, t.key, t.key) == 0; }},
    {"data_ark_remove", [](Things& t) { return data_ark_remove(t.ark.get(), t.key, t.key) == 0; }},
    {"data_ark_exists", [](Things& t) { return data_ark_exists(t.ark.get(), t.key, t.key) == 1; }},
    {"data_ark_add_to_class", [](Things& t) { return data_ark_add_to_class(t.ark.get(), {}, t.key, 1) == 0; }},
    {"data_ark_register_notification",
     [](Things& t) { return data_ark_register_notification(t.ark.get(), {}, t.key, t.key, 7) == 0; }, 0,
     Kind::in_steps},
    {"data_ark_key", [](Things& t) { return all(data_ark_key(t.domain, t.key)); }},
    {"data_ark_copy", [](Things& t) { return data_ark_copy(t.ark.get(), t.key, t.key) == t.key; }},
    {"data_ark_copy, a domain", [](Things& t) { return data_ark_copy(t.ark.get(), t.domain, {}).size() == 20; }},
    {"data_ark_copy, live", [](Things& t) { return all(data_ark_copy(t.ark.get(), {}, keys::kSerialNumber)); }},
    {"larry_lookup, a question", [](Things&) { return all(larry_lookup({}, keys::kSerialNumber, 0)); }},
    {"larry_lookup, its name", [](Things&) { return all(larry_lookup({}, keys::kSerialNumber, 1)); }},
    {"post_system_notification", [](Things& t) { return post_system_notification(t.domain), true; }, 2},
    {"daemon_log", [](Things& t) { return daemon_log(0, "log", "%@ %s", t.value, kLong.c_str()), true; }},
    {"the device type", [](Things&) { return all(get_device_type_internal().product_type); }, 1, Kind::once_only},
    {"a telephony delivery", serve_event, 20, Kind::once_only, send_event},
    {"lookup_baseband_info_old", [](Things& t) { return lookup_baseband_info_old(t.ark.get()), true; }, 2,
     Kind::ordinary, deliver_event},
    {"lookup_baseband_info_new", [](Things& t) { return lookup_baseband_info_new(t.ark.get()), true; }, 2,
     Kind::may_die, deliver_event},
    {"the regulatory images",
     [](Things& t) {
       platform::IpcReply unwanted;
       t.daemon.copyRegulatoryImagesWithCompletionBlock(unwanted);
       return true;
     }},
    {"a client's request", ask_service, 0, Kind::ordinary, start_service, end_service},
};

// Runs a case with an allocation failing. Returns how many failed.
long run(const Case& c, Fault fault, long number) {
  Things things;
  if (c.before != nullptr) c.before(things);
  const std::string before = things.state();
  allocations::fail(fault, number);
  const bool done = c.operation(things);
  const long failed = allocations::stop_failing();
  EXPECT_TRUE(done || failed > 0);
  EXPECT_TRUE(done || c.kind == Kind::in_steps || things.state() == before);
  EXPECT_TRUE(things.holders[0] == entries("", 20) && things.holders[1] == array({1, 2, 3, 4}));
  if (c.behind != nullptr) c.behind(things);
  return failed;
}

// The same in a process of its own, which ends with status 0 when all was as it must be. The first run, in which
// nothing fails, makes what is made once in a process.
[[noreturn]] void run_alone(const Case& c, Fault fault, long number, long& failed) noexcept {
  ::alarm(60);
  const auto faults = [] {
    return testing::UnitTest::GetInstance()->current_test_info()->result()->total_part_count();
  };
  const int faults_before = faults();
  if (c.kind != Kind::once_only) run(c, Fault::none, 0);
  const long blocks = allocations::blocks();
  failed = run(c, fault, number);
  EXPECT_LE(allocations::blocks() - blocks, c.kept) << "leaked";
  std::cout.flush();
  ::_exit(faults() > faults_before ? 1 : 0);
}

struct Tally {
  long injected = 0;
  long deaths = 0;
};

// Fails each allocation of a case in turn, until there is none left.
void sweep(const Case& c, Fault fault, Tally& tally) {
  static auto* const failed =
      static_cast<long*>(::mmap(nullptr, sizeof(long), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
  for (long number = 0;; ++number, ++tally.injected) {
    static_cast<void>(root->log_lines());
    *failed = -1;  // until the case lives to tell
    std::cout.flush();
    const pid_t child = ::fork();
    if (child == 0) run_alone(c, fault, number, *failed);
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    const auto lines = root->log_lines();
    const bool died = c.kind == Kind::may_die && std::count(lines.begin(), lines.end(), kDying) == 1;
    ASSERT_EQ(status, died ? 255 << 8 : 0) << c.name << ": " << number << testing::PrintToString(lines);
    tally.deaths += died ? 1 : 0;
    if (*failed == 0) return;
  }
}

TEST(AllocationSweep, NothingDiesLeaksOrLies) {
#if defined(__SANITIZE_THREAD__)
  GTEST_SKIP() << "the thread sanitizer does not support what a process does after a fork beside threads";
#endif
  ScratchRoot scratch;
  root = &scratch;
  scratch.ignore_log();
  scratch.write_plist("/private/var/mobile/Library/qvd/regulatory_images/regulatory_images.plist", entries("", 20));
  scratch.write_plist("/etc/quorvel/device_information.plist",
                      dictionary({{"ProductType", "a"}, {"SerialNumber", "b"}}));
  telephony = listen_on("telvane.sock");
  platform::host::start_notification_server();
  daemon_log(0, "test", "opens the log");

  std::map<std::string_view, Tally> tallies;
  long injected = 0;
  for (const Case& c : kCases) {
    Tally& tally = tallies[c.name];
    for (const Fault fault : {Fault::once, Fault::from_then_on}) sweep(c, fault, tally);
    EXPECT_EQ(tally.injected == 0, std::string_view(c.name) == "daemon_log") << c.name;
    injected += tally.injected;
  }
  tell_figure("one failing allocation, in turn and from then on", "500, 0 leaks, 0 deaths but the documented one",
              std::to_string(injected), injected >= 500);
  // make_mutable makes one allocation, and nothing else in a telephony run may end the process.
  EXPECT_EQ(tallies["make_mutable"].deaths, 2);
  EXPECT_EQ(tallies["lookup_baseband_info_new"].deaths, 2);
}

}  // namespace quorvel::test
