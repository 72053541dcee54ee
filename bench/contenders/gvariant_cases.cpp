#include "bench/cases/codec_cases.h"
#include "bench/contenders/gvariant_codec.h"

namespace quorvel::bench {
namespace {

[[maybe_unused]] const bool registered = register_codec<GVariantCodec>(kSize) && register_release<GVariantCodec>(kSize);

}  // namespace
}  // namespace quorvel::bench
