#include "bench/processes/sd_bus_service.h"

namespace quorvel::bench {

std::unique_ptr<Service> make_sd_bus_service() { return nullptr; }

}  // namespace quorvel::bench
