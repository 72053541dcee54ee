#include "faults/daemon_under_faults.h"

#include <sys/mman.h>

#include <algorithm>
#include <new>

namespace quorvel::test {
namespace {

const std::string kImageFolder = std::string(kStateDirectory) + "/regulatory_images";
const std::string kImages = kImageFolder + "/regulatory_images.plist";
constexpr auto kServiceDeadline = 5s;

const PropertyValue& images() {
  static const PropertyValue value = dictionary({{"Rest of World", test::data(std::string(3000, '\x89'))}});
  return value;
}

faults::Plan* map_plan(const std::string& path) {
  const Descriptor file(::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
  if (::ftruncate(file.get(), sizeof(faults::Plan)) != 0) throw std::runtime_error("no plan");
  void* mapping = ::mmap(nullptr, sizeof(faults::Plan), PROT_READ | PROT_WRITE, MAP_SHARED, file.get(), 0);
  if (mapping == MAP_FAILED) throw std::runtime_error("no plan");
  return new (mapping) faults::Plan{};
}

PropertyValue kept_entries() {
  PropertyValue entries = dictionary({});
  for (int i = 0; i < 200; ++i) {
    const std::string number = std::to_string(i);
    if (!entries.set(text("-Kept" + number), text(std::string(200, 'x') + number))) throw std::bad_alloc();
  }
  return entries;
}

}  // namespace

DaemonUnderFaults::DaemonUnderFaults() : plan_path_((root.outside() / "plan").string()), plan_(map_plan(plan_path_)) {
  root.ignore_log();
  PropertyValue entries = kept_entries();
  new_data_ = encoded(entries);
  static_cast<void>(entries.set(text("-PhoneNumber"), text("5")));
  old_data_ = encoded(entries);
  prepare();
  start();
  if (!program_->wait_until_ready() || !holds_new_data()) throw std::runtime_error("the daemon does not save");
  kill();
}

faults::Plan& DaemonUnderFaults::prepare() {
  root.remove(std::string(kDataFile) + ".unreadable");
  root.write_file(kDataFile, old_data_);
  provision_images();
  return *new (plan_) faults::Plan{};
}

void DaemonUnderFaults::start() {
  ProgramOptions options;
  options.environment = {{"LD_PRELOAD", QUORVEL_FAULTS_SHIM}, {faults::kPlanVariable, plan_path_}};
  program_.reset();
  program_ = std::make_unique<Program>(QUORVEL_FAULTS_DAEMON, options);
}

void DaemonUnderFaults::start_without_library() {
  program_.reset();
  program_ = std::make_unique<Program>(QUORVEL_FAULTS_DAEMON);
}

bool DaemonUnderFaults::has_ended(std::chrono::milliseconds patience) {
  const auto deadline = std::chrono::steady_clock::now() + patience;
  while (program_->running()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::sleep_for(100us);
  }
  return true;
}

std::vector<faults::Call> DaemonUnderFaults::trace() const {
  const std::uint32_t count = std::min(plan_->calls.load(), faults::Plan::kTraceSize - 1);
  std::vector<faults::Call> calls;
  for (std::uint32_t number = 1; number <= count; ++number) calls.push_back(plan_->trace[number]);
  return calls;
}

std::string DaemonUnderFaults::data() const { return root.exists(kDataFile) ? root.read_file(kDataFile) : ""; }

std::string DaemonUnderFaults::store_fault() const {
  const std::string found = data();
  if (found == old_data_ || found == new_data_) return "";
  return "the data file has " + std::to_string(found.size()) + " bytes and is neither the old nor the new one";
}

std::string DaemonUnderFaults::service_fault() {
  provision_images();
  const auto deadline = std::chrono::steady_clock::now() + kServiceDeadline;
  client::Reply reply;
  do {
    reply = call(1s);
    if (!reply.error) break;
    std::this_thread::sleep_for(1ms);
  } while (std::chrono::steady_clock::now() < deadline);
  if (reply.error) return "a client is not served: " + reply.error->description;
  if (reply.value != images()) return "a client is answered with " + described(reply.value);
  const std::size_t mark = log_of(kLogFile).size();
  const std::string line = provision_no_images();
  if (call(2s).error) return "a client is not served the second time";
  // Other threads log as well, and a line may have filled the log.
  std::string behind = log_of(kLogFile);
  if (behind.size() >= mark) {
    behind.erase(0, mark);
  } else {
    const std::string before = log_of(std::string(kLogFile) + ".1");
    behind.insert(0, before, std::min(mark, before.size()));
  }
  return behind.find(line) != std::string::npos ? "" : "the log does not go on";
}

std::string DaemonUnderFaults::log_of(const std::string& path) const {
  return root.exists(path) ? root.read_file(path) : "";
}

std::string DaemonUnderFaults::descriptor_fault(std::size_t allowed) const {
  const auto open = [this] { return descriptors_open(program_->pid()); };
  if (eventually([&] { return open() <= allowed; }, 2s)) return "";
  return std::to_string(open()) + " descriptors are open instead of " + std::to_string(allowed);
}

std::string DaemonUnderFaults::ending_fault() {
  program_->send_signal(SIGTERM);
  if (!has_ended(3s)) return "SIGTERM does not end it";
  const Outcome outcome = program_->wait();
  return outcome.status == 0 ? "" : "it ends with status " + std::to_string(outcome.status);
}

client::Reply DaemonUnderFaults::call(std::chrono::milliseconds timeout) const {
  client::Options options;
  options.timeout = timeout;
  return client::Client(options).copy_regulatory_images();
}

void DaemonUnderFaults::provision_images() { root.write_plist(kImages, images()); }

std::string DaemonUnderFaults::provision_no_images() {
  const mode_t mode = 0700 | (++modes_ & 077);
  root.remove(kImages);
  root.set_mode(kImageFolder, mode);
  char line[16];
  std::snprintf(line, sizeof line, " p=%o\n", S_IFDIR | mode);
  return line;
}

}  // namespace quorvel::test
