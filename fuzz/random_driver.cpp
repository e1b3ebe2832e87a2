// Drives a fuzz target without libFuzzer: the seed files first, then
// pseudo-random mutations of them, for a fixed number of runs, so that the
// same inputs run in every build.
#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <string>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);

int main(int argc, char** argv) {
  if (argc < 2) {
    std::fprintf(stderr, "usage: %s SEED_DIR [RUNS]\n", argv[0]);
    return 2;
  }
  const long runs = argc > 2 ? std::atol(argv[2]) : 20000;
  std::vector<std::string> seeds;
  for (const auto& entry : std::filesystem::directory_iterator(argv[1])) {
    std::ifstream in(entry.path(), std::ios::binary);
    seeds.emplace_back(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
  }
  if (seeds.empty()) seeds.emplace_back();
  for (const std::string& s : seeds) LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(s.data()), s.size());

  std::mt19937 random(12345);
  // Characters that mean something to one parser or another: separators,
  // JSON's and REGEDIT4's punctuation, path parts, the pieces of numbers.
  const std::string alphabet = "|,; \n\\\"=@[]{}-+.:/&HheEabcXYZ0129#\r\t";
  for (long i = 0; i < runs; ++i) {
    std::string input = seeds[random() % seeds.size()];
    const int edits = 1 + static_cast<int>(random() % 8);
    for (int e = 0; e < edits; ++e) {
      const size_t at = input.empty() ? 0 : random() % (input.size() + 1);
      switch (random() % 4) {
        case 0: input.insert(at, 1, alphabet[random() % alphabet.size()]); break;
        case 1: if (at < input.size()) input.erase(at, 1); break;
        case 2: if (at < input.size()) input[at] = static_cast<char>(random() % 256); break;
        default: {
          // A piece of some seed, so that whole tokens and structures move.
          const std::string& from = seeds[random() % seeds.size()];
          if (from.empty()) break;
          const size_t start = random() % from.size();
          const size_t length = 1 + random() % std::min<size_t>(16, from.size() - start);
          input.insert(at, from, start, length);
          break;
        }
      }
    }
    LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(input.data()), input.size());
  }
  std::printf("%zu seeds and %ld mutated inputs passed\n", seeds.size(), runs);
  return 0;
}
