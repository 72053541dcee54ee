#include "status_checks.h"

#include <sys/stat.h>

#include <chrono>
#include <cstdio>
#include <optional>
#include <utility>

#include "common/failure.h"
#include "common/human_text.h"
#include "files.h"
#include "output.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "quorvel/client.h"

namespace quorvel::tools {
namespace {

using namespace std::chrono_literals;

constexpr auto kPatience = 2s;

bool exists(const char* path, struct stat* status) { return platform::file_status(path, status) == 0; }

void put_server(PropertyValue& facts, const Server& server) {
  if (server.process > 0) {
    put(facts, "process", PropertyValue::integer(server.process));
    put(facts, "program", PropertyValue::string(displayable(program_of(server.process))));
  }
  put(facts, "user", PropertyValue::string(user_name(server.user)));
}

bool is_foreign(const Server& service) { return service.state == Server::State::serving && !is_believed(service); }

// Why the daemon does not follow the service that is there or should be, as far as one sees from outside.
std::string why_not_followed(const Server& service, const Server& daemon) {
  if (service.state == Server::State::absent) {
    struct stat socket {};
    return exists(paths::kTelephonySocket, &socket)
               ? std::string("nobody serves ") + paths::kTelephonySocket + ", which is there"
               : std::string("nothing is at ") + paths::kTelephonySocket + ": the service does not run";
  }
  if (is_foreign(service))
    return "it is served by " + name_of(service) + ", which is neither root nor the owner of /run/quorvel";
  struct stat mark {};
  if (!exists(paths::kTelephonyMark, &mark))
    return std::string("the daemon may have started without it: make ") + paths::kTelephonyMark +
           " and restart the daemon";
  if (static_cast<double>(mark.st_ctim.tv_sec) >= start_of(daemon.process).value_or(0))
    return std::string("the daemon may have started before ") + paths::kTelephonyMark + " was made: restart the daemon";
  return is_installed_system() ? "the daemon says why with: journalctl -u quorveld"
                               : "the daemon says why on its standard error";
}

}  // namespace

void find_ill(Finding& finding, std::string reason, const std::string& heading) {
  finding.verdict = Verdict::ill;
  finding.lines.push_back(heading + reason);
  finding.reason = std::move(reason);
}

Finding check_calls() {
  client::Options options;
  options.timeout = kPatience;
  const auto start = std::chrono::steady_clock::now();
  // There is no such operation: that the daemon says so is an answer, and nothing else happens.
  const client::Reply reply = client::Client(options).call("status", {});
  const auto milliseconds = std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
  Finding finding{"calls", Verdict::well, {}, {}, PropertyValue::dictionary()};
  const bool answered = reply.error && reply.error->code == client::ErrorCode::service_failure;
  put(finding.facts, "ready", PropertyValue::boolean(answered));
  if (answered) {
    char text[64];
    std::snprintf(text, sizeof text, "answered in %.1f ms", milliseconds);
    finding.lines.emplace_back(text);
    put(finding.facts, "milliseconds", PropertyValue::real(milliseconds));
  } else {
    find_ill(finding, reply.error ? reply.error->description : std::string("no reply"), "not answered: ");
  }
  return finding;
}

Finding check_daemon(const Server& daemon) {
  Finding finding{"daemon", Verdict::well, {}, {}, PropertyValue::dictionary()};
  const bool running = daemon.state == Server::State::serving || daemon.state == Server::State::refused;
  put(finding.facts, "running", PropertyValue::boolean(running));
  if (!running) {
    finding.verdict = daemon.state == Server::State::absent ? Verdict::absent : Verdict::ill;
    finding.reason = daemon.state == Server::State::absent ? "not running. " + how_to_start("quorveld") : daemon.reason;
    finding.lines.push_back(finding.reason);
    return finding;
  }
  finding.lines.push_back("running, " + name_of(daemon));
  put_server(finding.facts, daemon);
  if (const std::optional<double> start = daemon.process > 0 ? start_of(daemon.process) : std::nullopt) {
    finding.lines.push_back("since " + since_text(*start - kSecondsTo2001));
    put(finding.facts, "since", PropertyValue::date(*start - kSecondsTo2001));
  }
  return finding;
}

Finding check_telephony(const Server& daemon) {
  Finding finding{"telephony", Verdict::well, {}, {}, PropertyValue::dictionary()};
  struct stat status {};
  const bool marked = exists(paths::kTelephonyMark, &status);
  const bool expected = marked || exists(paths::kTelephonySocket, &status);
  put(finding.facts, "expected", PropertyValue::boolean(expected));
  if (!expected) {
    finding.lines.push_back(std::string("none on this device: there is no ") + paths::kTelephonyMark);
    return finding;
  }
  const Server service = server_of("telvane");
  const std::optional<bool> followed = daemon.process > 0 ? follows_telephony(daemon.process) : false;
  if (followed) put(finding.facts, "followed", PropertyValue::boolean(*followed));
  if (service.state == Server::State::serving && has_ended(service)) {
    find_ill(finding, "process " + std::to_string(service.process) + ", which served it, has ended");
    return finding;
  }
  if (followed.value_or(false)) {
    finding.lines.emplace_back("followed");
  } else if (!followed && service.state != Server::State::absent && !is_foreign(service)) {
    finding.verdict = Verdict::unknown;
    finding.reason = "only root and the daemon's user can see whether it is";
    finding.lines.push_back("followed or not: " + finding.reason);
  } else {
    find_ill(finding, daemon.process > 0 ? why_not_followed(service, daemon) : "the daemon does not run",
             "not followed: ");
  }
  if (service.state != Server::State::serving) return finding;
  finding.lines.push_back("served by " + name_of(service));
  PropertyValue server = PropertyValue::dictionary(3);
  put_server(server, service);
  put(finding.facts, "service", server);
  return finding;
}

}  // namespace quorvel::tools
