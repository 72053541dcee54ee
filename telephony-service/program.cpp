#include "telephony-service/program.h"

#include <sys/signalfd.h>

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <iostream>
#include <memory>
#include <new>
#include <optional>
#include <system_error>

#include "common/command_words.h"
#include "common/completion.h"
#include "common/failure.h"
#include "common/help_text.h"
#include "common/human_text.h"
#include "common/root_option.h"
#include "common/words.h"
#include "linux/base/error_line.h"
#include "linux/process/service_manager.h"
#include "telephony-service/listener.h"

namespace quorvel::telephony {

using tools::Failure;

namespace {

void finish_output() {
  if (std::cout.flush()) return;
  throw Failure{kSystemError, std::string("cannot write to standard output: ") + std::strerror(errno)};
}

}  // namespace

CallWords::CallWords(const tools::CommandWords& words)
    : app_(std::make_unique<CLI::App>(tools::description_of(words), words.name)) {
  app_->formatter(std::make_shared<tools::HelpFormatter>());
  app_->footer(words.examples);
  tools::add_option(*app_, "--root", root_, "DIR", tools::kRootHelp);
}

CallWords::~CallWords() = default;

bool CallWords::take(int count, char** words) {
  app_->set_version_flag("--version", app_->get_name() + " " QUORVEL_VERSION, "Print the version and end");
  if (const std::optional<std::string> answer = tools::answer_for_tools(*app_, count, words, {})) {
    std::cout << *answer;
    finish_output();
    return false;
  }
  try {
    app_->parse(tools::marked_words(count, words));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() != 0) throw Failure{kUsage, tools::complaint(*app_, error)};
    app_->exit(error);
    finish_output();
    return false;
  }
  tools::use_device_root(tools::is_given(*app_, "--root") ? std::optional(root_) : std::nullopt, kConfiguration);
  return true;
}

Descriptor open_end_signals() {
  std::signal(SIGPIPE, SIG_IGN);
  sigset_t set;
  sigemptyset(&set);
  sigaddset(&set, SIGTERM);
  sigaddset(&set, SIGINT);
  ::sigprocmask(SIG_BLOCK, &set, nullptr);
  Descriptor signals(::signalfd(-1, &set, SFD_CLOEXEC | SFD_NONBLOCK));
  if (!signals) throw Failure{kSystemError, std::string("cannot watch signals: ") + std::strerror(errno)};
  return signals;
}

platform::host::ListeningSocket claim_listener() {
  try {
    return open_listener();
  } catch (const std::system_error& error) {
    if (error.code().value() == EADDRINUSE) {
      throw Failure{kServiceUnavailable, "a telephony service is running already on " + socket_path()};
    }
    throw Failure{kSystemError, std::string("cannot serve ") + error.what()};
  }
}

void print_line(const std::string& program, const std::string& text) {
  std::fprintf(stderr, "%s: %s\n", program.c_str(), tools::displayable(text).c_str());
}

int run_program(const std::string& program, int (*run)(int count, char** words), int count, char** words) {
  platform::host::name_error_lines(::program_invocation_short_name);
  // Before anything is opened, which could pass for a socket that was announced and is not there.
  platform::host::settle_passed_sockets();
  try {
    return run(count, words);
  } catch (const Failure& failure) {
    print_line(program, failure.message);
    return failure.status;
  } catch (const std::bad_alloc&) {
    std::fprintf(stderr, "%s: memory does not suffice\n", program.c_str());
  } catch (const std::exception& failure) {
    std::fprintf(stderr, "%s: %s\n", program.c_str(), failure.what());
  }
  return kSystemError;
}

}  // namespace quorvel::telephony
