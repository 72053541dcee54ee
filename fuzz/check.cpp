// The two sinks of the walk over a file's objects: whatever the check accepts is a dictionary to the reader, and the
// check accepts the dictionaries that the writer writes.
#include "support/values.h"
#include "target.h"

void quorvel::fuzz::run_once(Bytes input) {
  const char* fault = test::check_fault(input);
  require(fault == nullptr, fault);
}
