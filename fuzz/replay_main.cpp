// Runs a target over its corpus, in builds without libFuzzer. Fails when there is none.
#include <filesystem>
#include <fstream>
#include <iostream>
#include <iterator>
#include <string>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

int main(int, char** arguments) {
  std::size_t count = 0;
  for (const auto& entry : std::filesystem::directory_iterator(arguments[1])) {
    std::ifstream file(entry.path(), std::ifstream::binary);
    const std::string input{std::istreambuf_iterator<char>(file), {}};
    std::cerr << entry.path().filename().string() << '\n';
    LLVMFuzzerTestOneInput(reinterpret_cast<const std::uint8_t*>(input.data()), input.size());
    ++count;
  }
  std::cout << count << " inputs replayed\n";
  return count > 0 ? 0 : 1;
}
