#include "bench/cases/codec_cases.h"
#include "bench/cases/file_cases.h"
#include "bench/contenders/msgpack_codec.h"
#include "bench/support/scratch_root.h"

namespace quorvel::bench {
namespace {

/// Saves as durably as the data ark does.
class MsgpackSaver {
 public:
  explicit MsgpackSaver(std::size_t entries) : data_(data_set(entries)), tree_(MsgpackCodec::make(data_)) {}

  void use() const {}
  void save() const { replace_file(file(), MsgpackCodec::bytes(MsgpackCodec::encode(tree_)), Flushing::durable); }
  [[nodiscard]] static std::filesystem::path file() { return scratch_root().outside() / "data.msgpack"; }
  [[nodiscard]] static MsgpackTree nothing() { return {}; }
  [[nodiscard]] static MsgpackTree load() { return MsgpackCodec::decode(read_file(file()).bytes()); }
  [[nodiscard]] bool looks_whole(const MsgpackTree& tree) const { return MsgpackCodec::size(tree) == data_.size(); }
  [[nodiscard]] bool matches(const MsgpackTree& tree) const { return MsgpackCodec::matches(tree, data_); }

 private:
  const DataSet& data_;
  MsgpackTree tree_;
};

// No release: nothing in a zone is counted, so that nothing can outlive the rest of it.
[[maybe_unused]] const bool registered = register_codec<MsgpackCodec>(kSize) && register_encode_again<MsgpackCodec>() &&
                                         register_files<MsgpackSaver>(kSize, MsgpackCodec::kName);

}  // namespace
}  // namespace quorvel::bench
