// Nothing in the daemon throws. For an exception that appears nevertheless, the standard library's own handler would
// print the name of the type, and bring 60 KiB of code that undoes the mangling of names.

#include <cstdlib>

namespace __gnu_cxx {

// NOLINTBEGIN(bugprone-reserved-identifier): the name is that of the function it replaces
void __verbose_terminate_handler();
void __verbose_terminate_handler() { std::abort(); }
// NOLINTEND(bugprone-reserved-identifier)

}  // namespace __gnu_cxx
