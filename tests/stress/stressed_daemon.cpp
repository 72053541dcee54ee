#include "stress/stressed_daemon.h"

#include <sys/resource.h>

#include <fstream>

#include "protocol/quorvel_protocol.h"
#include "wire/service_path.h"

namespace quorvel::test {
namespace {

const std::string kImages = std::string(kStateDirectory) + "/regulatory_images/regulatory_images.plist";
constexpr const char* kImageKey = "Rest of World";

double milliseconds_since(std::chrono::steady_clock::time_point start) {
  return std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
}

std::string in_proc(pid_t pid, const char* name) { return "/proc/" + std::to_string(pid) + "/" + name; }

long status_entry(pid_t pid, const std::string& name) {
  std::ifstream status(in_proc(pid, "status"));
  for (std::string line; std::getline(status, line);)
    if (line.starts_with(name)) return std::stol(line.substr(name.size()));
  throw std::runtime_error("no " + name + " of process " + std::to_string(pid));
}

}  // namespace

long resident_kib(pid_t pid) { return status_entry(pid, "VmRSS:"); }
long own_kib(pid_t pid) { return status_entry(pid, "RssAnon:"); }
long peak_resident_kib(pid_t pid) { return status_entry(pid, "VmHWM:"); }

void forget_peak(pid_t pid) { std::ofstream(in_proc(pid, "clear_refs")) << "5\n"; }

std::chrono::nanoseconds processor_time(pid_t pid) {
  std::ifstream file(in_proc(pid, "stat"));
  std::string stat{std::istreambuf_iterator<char>(file), {}};
  long user = 0;
  long system = 0;
  // Fields 14 and 15; the name before them may hold anything, but ends with the last parenthesis.
  std::sscanf(stat.c_str() + stat.rfind(')') + 1, " %*c %*s %*s %*s %*s %*s %*s %*s %*s %*s %*s %ld %ld", &user,
              &system);
  return std::chrono::nanoseconds((user + system) * (1'000'000'000L / ::sysconf(_SC_CLK_TCK)));
}

Latencies latencies_of(std::vector<double> samples) {
  if (samples.empty()) throw std::runtime_error("nothing was measured");
  std::sort(samples.begin(), samples.end());
  return {samples[samples.size() / 2], samples[samples.size() * 99 / 100], samples.back()};
}

std::string written(double number, std::string_view unit) {
  char text[64];
  std::snprintf(text, sizeof text, number < 10 ? "%.2f %.*s" : "%.0f %.*s", number, static_cast<int>(unit.size()),
                unit.data());
  return text;
}

std::string written(const Latencies& latencies) {
  return "p50 " + written(latencies.p50, "ms") + ", p99 " + written(latencies.p99, "ms") + ", worst " +
         written(latencies.worst, "ms");
}

std::string image_call(std::uint64_t serial) {
  return frame_bytes(wire::FrameKind::call, serial, protocol::kCopyRegulatoryImages);
}

SocketPeer connected_now() {
  return SocketPeer::connected_to(std::string(protocol::kServiceName) + std::string(wire::kSocketSuffix));
}

SocketPeer connected() {
  SocketPeer peer{Descriptor()};
  if (!eventually([&] { return static_cast<bool>(peer = connected_now()); }))
    throw std::runtime_error("the daemon takes no connection");
  return peer;
}

StressedDaemon::StressedDaemon() {
  root.ignore_log();
  rlimit limit;
  ::getrlimit(RLIMIT_NOFILE, &limit);
  limit.rlim_cur = std::min<rlim_t>(limit.rlim_max, 8192);
  ::setrlimit(RLIMIT_NOFILE, &limit);
}

void StressedDaemon::start(int descriptor_limit) {
  if (descriptor_limit == 0) {
    daemon_ = std::make_unique<Program>(daemon_program());
  } else {
    const std::string command = "ulimit -n " + std::to_string(descriptor_limit) + " && exec " + daemon_program();
    daemon_ = std::make_unique<Program>("/bin/sh", ProgramOptions{.arguments = {"-c", command}, .input = {}});
  }
  ASSERT_TRUE(daemon_->wait_until_ready()) << daemon_->err();
}

void StressedDaemon::expect_quick_end(std::string_view stage) {
  const auto start = std::chrono::steady_clock::now();
  const Outcome outcome = daemon_->stop();
  const double taken = milliseconds_since(start);
  EXPECT_EQ(outcome.status, 0) << stage << ": " << outcome.err;
  EXPECT_TRUE(taken < 1000 || kInstrumented) << stage;
  std::printf("SIGTERM %.*s: ended after %.0f ms\n", static_cast<int>(stage.size()), stage.data(), taken);
}

std::size_t StressedDaemon::settled_descriptors() const {
  std::size_t count = 0;
  int times = 0;
  static_cast<void>(eventually([&] {
    const std::size_t now = descriptors_open(pid());
    times = now == count ? times + 1 : 0;
    count = now;
    return times == 20;
  }));
  return count;
}

void StressedDaemon::provision_images(std::size_t size) {
  image_size_ = size;
  root.write_plist(kImages + ".new", dictionary({{kImageKey, test::data(std::string(size, 'i'))}}));
  std::filesystem::rename(root.path(kImages + ".new"), root.path(kImages));
}

void StressedDaemon::remove_images() {
  image_size_ = 0;
  root.remove(kImages);
}

double StressedDaemon::well_behaved_call() const {
  const auto start = std::chrono::steady_clock::now();
  const client::Reply reply = client::Client().copy_regulatory_images();
  const double taken = milliseconds_since(start);
  EXPECT_FALSE(reply.error) << reply.error->description;
  EXPECT_EQ(reply.value.get(HashedKey(kImageKey)).bytes().size(), image_size_)
      << descriptors_open(pid()) << " descriptors are open; " << root.read_file(kLogFile).substr(0, 2000);
  return taken;
}

}  // namespace quorvel::test
