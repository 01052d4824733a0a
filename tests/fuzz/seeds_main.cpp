// Runs a target without libFuzzer: over the files of a folder, and a fixed set of mutations of
// them.
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <vector>

#include "fuzz.hpp"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

constexpr int kMutations = 2000;

class Mutator {
 public:
  explicit Mutator(const std::vector<std::string>& seeds) : seeds_(seeds) {}

  std::string next() {
    std::string text = seeds_[below(seeds_.size())];
    for (std::size_t edits = 1 + below(6); edits > 0; --edits) {
      edit(text);
    }
    return text;
  }

 private:
  std::size_t below(std::size_t end) { return random_() % std::max<std::size_t>(end, 1); }

  void edit(std::string& text) {
    constexpr std::string_view kTelling{"\0\n\r\t \"'\\<[]{}=,#-%\x7f\xc3\xff", 22};
    const std::string& other = seeds_[below(seeds_.size())];
    const std::size_t at = below(text.size() + 1);
    const std::size_t length = below(std::min<std::size_t>(text.size() - at, 16) + 1);
    switch (below(5)) {
      case 0:
        text.erase(at, length);
        break;
      case 1:
        text.insert(at, 1, static_cast<char>(below(256)));
        break;
      case 2:
        text.insert(at, 1 + below(3), kTelling[below(kTelling.size())]);
        break;
      case 3:
        text.insert(at, text.substr(at, length));
        break;
      default:
        text.replace(at, length, other, below(other.size() + 1), 1 + below(24));
    }
  }

  const std::vector<std::string>& seeds_;
  std::mt19937 random_;  // of a fixed seed
};

void run(const std::string& text) {
  LLVMFuzzerTestOneInput(reinterpret_cast<const std::uint8_t*>(text.data()), text.size());
}

}  // namespace

int main(int count, char** arguments) {
  std::vector<std::string> seeds;
  for (const auto& entry : std::filesystem::directory_iterator(count > 1 ? arguments[1] : ".")) {
    std::ifstream file(entry.path(), std::ios::binary);
    seeds.emplace_back(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
  }
  fuzz::require(!seeds.empty(), "there are seeds");
  std::sort(seeds.begin(), seeds.end());
  for (const std::string& seed : seeds) {
    run(seed);
  }
  Mutator mutator(seeds);
  for (int i = 0; i < kMutations; ++i) {
    run(mutator.next());
  }
}
