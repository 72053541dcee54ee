// The program's allocator, watched: what is allocated, and which allocation fails.
#pragma once

#include <cstddef>

namespace quorvel::test::allocations {

/// Blocks and bytes that live now, of all threads; the most bytes since `forget_peak`.
[[nodiscard]] long blocks();
[[nodiscard]] long bytes();
[[nodiscard]] long peak_bytes();
void forget_peak();

enum class Fault { none, once, from_then_on };

/// From now on allocation `number` (the first is 0) made by any thread but those that are spared fails, once or with
/// all that follow it.
void fail(Fault fault, long number);
/// Ends that. Returns how many allocations failed.
long stop_failing();
/// The calling thread's allocations never fail and are not numbered.
void spare_this_thread();

}  // namespace quorvel::test::allocations
