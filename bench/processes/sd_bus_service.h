#pragma once

#include <memory>

#include "bench/processes/service.h"

namespace quorvel::bench {

/// sd-bus, peer to peer; null where its server was not built.
[[nodiscard]] std::unique_ptr<Service> make_sd_bus_service();

}  // namespace quorvel::bench
