#include "support/values.h"
#include "target.h"

void quorvel::fuzz::run_once(Bytes input) {
  for (const Mutability mutability : {Mutability::immutable, Mutability::mutable_containers}) {
    const char* fault = test::round_trip_fault(input, mutability);
    require(fault == nullptr, fault);
  }
}
