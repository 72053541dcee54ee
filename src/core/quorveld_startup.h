#pragma once

#include "store/data_ark.h"

namespace quorvel {

/// Secures the state directory, loads and prepares the data ark, starts observing the telephony service and saves the
/// data ark, which it returns; never null: without one the process ends with status 71. Main thread, once.
[[nodiscard]] DataArk* quorveld_startup() noexcept;

}  // namespace quorvel
