#pragma once

#include <vector>

#include "store/data_ark.h"

namespace quorvel::test {

/// Loads a data ark that the process keeps to its end, as the daemon does.
inline DataArk* load_kept_ark() {
  static auto& arks = *new std::vector<DataArk*>;
  return arks.emplace_back(data_ark_load());
}

}  // namespace quorvel::test
