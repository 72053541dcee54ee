// A fake modem as a program: prints the port for ModemManager, then obeys its standard input line by line, until that
// ends.
//
//   insert ICCID IMSI   a card is in the tray
//   eject               the tray is empty
#include <iostream>

#include "bridge/fake_modem.h"

// The digits as a card's file has them: padded, and swapped in pairs.
static std::string on_card(std::string iccid) {
  if (iccid.size() % 2 != 0) iccid += 'F';
  for (std::size_t i = 0; i < iccid.size(); i += 2) std::swap(iccid[i], iccid[i + 1]);
  return iccid;
}

int main(int count, char** words) {
  if (count != 2) {
    std::cerr << "Usage: fake-modem NAME\n";
    return 2;
  }
  quorvel::test::FakeModem modem(words[1]);
  modem.eject();
  std::cout << modem.port() << std::endl;
  for (std::string line; std::getline(std::cin, line);) {
    std::istringstream text(line);
    std::string verb, iccid, imsi;
    text >> verb >> iccid >> imsi;
    if (verb == "insert" && !imsi.empty()) {
      modem.insert(on_card(iccid), imsi);
    } else if (verb == "eject") {
      modem.eject();
    } else {
      std::cerr << "fake-modem: \"" << line << "\" means nothing\n";
      continue;
    }
    modem.report_swap();
  }
}
