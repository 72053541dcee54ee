#pragma once

namespace quorvel::bench {

inline constexpr const char* kBusPath = "/images";
inline constexpr const char* kBusInterface = "bench.Images";
inline constexpr const char* kBusMember = "Copy";

}  // namespace quorvel::bench
