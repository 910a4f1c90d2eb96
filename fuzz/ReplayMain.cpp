// Runs a fuzz target without libFuzzer: every seed file first, then deterministic
// mutations of the seeds (fixed seed), so that any compiler and CI exercise the parser.
//
//   fuzz-replay-NAME [--mutations N] [--verbose] [--dump K FILE] PATH...
//
// PATH is a seed file or a folder of seed files. --verbose names each input before it
// runs, so the one that crashes is known; --dump writes mutation K to FILE and exits.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size);
extern "C" int LLVMFuzzerInitialize(int* argc, char*** argv) __attribute__((weak));

namespace {

using Bytes = std::vector<uint8_t>;

constexpr size_t MaxInputSize = 1 << 20;

// splitmix64: the same sequence on every platform and standard library.
class Random
{
public:
    explicit Random(uint64_t seed) : m_state(seed) {}

    uint64_t next()
    {
        uint64_t z = (m_state += 0x9E3779B97F4A7C15ULL);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ULL;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBULL;
        return z ^ (z >> 31);
    }
    // A value in [0, bound); 0 when bound is 0.
    size_t below(size_t bound) { return bound == 0 ? 0 : size_t(next() % bound); }

private:
    uint64_t m_state;
};

struct Seed
{
    std::string name;
    Bytes data;
};

bool readFile(const std::filesystem::path& path, Bytes& data)
{
    std::ifstream in(path, std::ios::binary);
    if (!in)
        return false;
    data.assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
    return !in.bad();
}

bool collectSeeds(const std::vector<std::string>& paths, std::vector<Seed>& seeds)
{
    std::vector<std::filesystem::path> files;
    for (const std::string& path : paths) {
        std::error_code error;
        if (std::filesystem::is_directory(path, error)) {
            for (const auto& item : std::filesystem::directory_iterator(path, error))
                if (item.is_regular_file())
                    files.push_back(item.path());
        } else {
            files.emplace_back(path);
        }
    }
    std::sort(files.begin(), files.end());
    for (const auto& file : files) {
        Seed seed;
        seed.name = file.string();
        if (!readFile(file, seed.data)) {
            std::fprintf(stderr, "fuzz-replay: cannot read %s\n", seed.name.c_str());
            return false;
        }
        seeds.push_back(std::move(seed));
    }
    return true;
}

// Values that sit on the edges of counts, sizes and offsets.
uint32_t interestingValue(Random& random, size_t size)
{
    static const uint32_t values[] = { 0, 1, 2, 0x7F, 0x80, 0xFF, 0x100, 0x7FFF, 0x8000, 0xFFFF, 0x10000, 0x7FFFFFFF, 0x80000000, 0xFFFFFFFE, 0xFFFFFFFF };
    const size_t pick = random.below(std::size(values) + 2);
    if (pick < std::size(values))
        return values[pick];
    return uint32_t(pick == std::size(values) ? size : size + 1);
}

void mutateOnce(Bytes& data, const std::vector<Seed>& seeds, Random& random)
{
    const size_t size = data.size();
    switch (random.below(8)) {
    case 0: // flip one bit
        if (size)
            data[random.below(size)] ^= uint8_t(1u << random.below(8));
        break;
    case 1: // one byte to an edge value
        if (size)
            data[random.below(size)] = uint8_t(interestingValue(random, size));
        break;
    case 2: { // a little-endian 16- or 32-bit edge value
        const size_t width = random.below(2) ? 4 : 2;
        if (size >= width) {
            const uint32_t value = interestingValue(random, size);
            const size_t at = random.below(size - width + 1);
            for (size_t i = 0; i < width; ++i)
                data[at + i] = uint8_t(value >> (8 * i));
        }
        break;
    }
    case 3: // truncate
        data.resize(random.below(size + 1));
        break;
    case 4: { // insert random bytes
        Bytes inserted(1 + random.below(16));
        for (uint8_t& byte : inserted)
            byte = uint8_t(random.next());
        data.insert(data.begin() + std::ptrdiff_t(random.below(size + 1)), inserted.begin(), inserted.end());
        break;
    }
    case 5: { // erase a range
        const size_t at = random.below(size + 1);
        const size_t count = random.below(size - at + 1);
        data.erase(data.begin() + std::ptrdiff_t(at), data.begin() + std::ptrdiff_t(at + count));
        break;
    }
    case 6: { // repeat a range of the input inside it
        const size_t from = random.below(size + 1);
        const Bytes chunk(data.begin() + std::ptrdiff_t(from), data.begin() + std::ptrdiff_t(from + random.below(std::min<size_t>(size - from, 64) + 1)));
        data.insert(data.begin() + std::ptrdiff_t(random.below(size + 1)), chunk.begin(), chunk.end());
        break;
    }
    default: { // splice: this input's head, another seed's tail
        const Bytes& other = seeds[random.below(seeds.size())].data;
        data.resize(random.below(size + 1));
        data.insert(data.end(), other.begin() + std::ptrdiff_t(random.below(other.size() + 1)), other.end());
        break;
    }
    }
    if (data.size() > MaxInputSize)
        data.resize(MaxInputSize);
}

Bytes mutation(const std::vector<Seed>& seeds, size_t index, Random& random)
{
    Bytes data = seeds[index % seeds.size()].data;
    const size_t steps = 1 + random.below(4);
    for (size_t step = 0; step < steps; ++step)
        mutateOnce(data, seeds, random);
    return data;
}

void run(const Bytes& data, const std::string& label, bool verbose)
{
    if (verbose) {
        std::fprintf(stderr, "fuzz-replay: %s (%zu bytes)\n", label.c_str(), data.size());
        std::fflush(stderr);
    }
    LLVMFuzzerTestOneInput(data.data(), data.size());
}

int usage()
{
    std::fprintf(stderr, "usage: fuzz-replay [--mutations N] [--verbose] [--dump K FILE] PATH...\n");
    return 2;
}

} // namespace

int main(int argc, char** argv)
{
    if (LLVMFuzzerInitialize)
        LLVMFuzzerInitialize(&argc, &argv);

    size_t mutations = 5000;
    bool verbose = false;
    long dumpIndex = -1;
    std::string dumpPath;
    std::vector<std::string> paths;
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (arg == "--mutations" && i + 1 < argc)
            mutations = std::strtoul(argv[++i], nullptr, 10);
        else if (arg == "--verbose")
            verbose = true;
        else if (arg == "--dump" && i + 2 < argc) {
            dumpIndex = std::strtol(argv[++i], nullptr, 10);
            dumpPath = argv[++i];
        } else if (arg.rfind("--", 0) == 0)
            return usage();
        else
            paths.push_back(arg);
    }

    std::vector<Seed> seeds;
    if (paths.empty() || !collectSeeds(paths, seeds))
        return usage();
    if (seeds.empty()) {
        std::fprintf(stderr, "fuzz-replay: no seed files\n");
        return 1;
    }

    Random random(0x44656C766978ULL);
    if (dumpIndex >= 0) {
        Bytes data;
        for (long k = 0; k <= dumpIndex; ++k)
            data = mutation(seeds, size_t(k), random);
        std::ofstream out(dumpPath, std::ios::binary);
        out.write(reinterpret_cast<const char*>(data.data()), std::streamsize(data.size()));
        return out ? 0 : 1;
    }

    for (const Seed& seed : seeds)
        run(seed.data, seed.name, verbose);
    for (size_t k = 0; k < mutations; ++k)
        run(mutation(seeds, k, random), "mutation " + std::to_string(k), verbose);

    std::printf("fuzz-replay: %zu seeds and %zu mutations ran\n", seeds.size(), mutations);
    return 0;
}
