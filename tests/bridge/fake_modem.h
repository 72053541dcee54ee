// A modem that ModemManager talks to: a table of answers behind a socket.
#pragma once

#include <mutex>

#include "platform/descriptor.h"
#include "support/prelude.h"

namespace quorvel::test {

class FakeModem {
 public:
  explicit FakeModem(const std::string& name);
  ~FakeModem();
  FakeModem(const FakeModem&) = delete;
  FakeModem& operator=(const FakeModem&) = delete;

  /// The port's name for ModemManager.
  [[nodiscard]] const std::string& port() const { return port_; }
  /// Changes the answer to `command`; a text that begins with "+CME" or "ERROR" stands alone, others before OK.
  void answer(const std::string& command, const std::string& text);
  /// The card that is in the tray, or none.
  void insert(const std::string& swapped_iccid, const std::string& imsi);
  void eject();
  /// Has ModemManager look at the card again.
  void report_swap();

 private:
  void run();
  [[nodiscard]] std::string answer_to(const std::string& command);

  std::string port_;
  Descriptor listener_;
  Descriptor ending_;
  std::mutex mutex_;
  std::map<std::string, std::string> answers_;
  std::vector<Descriptor> connections_;
  std::thread thread_;
};

}  // namespace quorvel::test
