#include "bench/cases/codec_cases.h"
#include "bench/contenders/nlohmann_codec.h"

namespace quorvel::bench {
namespace {

[[maybe_unused]] const bool registered = register_codec<NlohmannCodec>(kSize) && register_release<NlohmannCodec>(kSize);

}  // namespace
}  // namespace quorvel::bench
