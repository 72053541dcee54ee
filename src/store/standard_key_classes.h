#pragma once

#include "store/data_ark.h"

namespace quorvel {

/// Gives the keys that the system knows their classes. Start-up, right after the load and before anything else writes.
void apply_standard_key_classes(DataArk* ark) noexcept;

}  // namespace quorvel
