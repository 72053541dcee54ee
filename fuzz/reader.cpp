#include "property/binary/binary.h"
#include "target.h"

void quorvel::fuzz::run_once(Bytes input) {
  const PropertyValue one = read_binary(input, Mutability::immutable);
  const PropertyValue other = read_binary(input, Mutability::mutable_containers);
  require(static_cast<bool>(one) == static_cast<bool>(other), "mutability decides what can be read");
  require(!one || one == other, "mutability changes what is read");
}
