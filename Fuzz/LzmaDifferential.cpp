// Compares our LZMA decoder with the SDK's on streams that the SDK's encoder makes at random settings, from odd data
// and from the files that are named; each as it is and damaged in many ways.
//   LzmaDifferential [--inputs N] [--size BYTES] [--seed N] [FILE...]
// --inputs: how many inputs are decoded, 100,000 by default; --size: of what is encoded, at most, 600 by default. A
// difference is printed with all that makes it again, and the status is then 1.
#include "Fuzz/LzmaComparison.h"

#include <lzma/LzmaEnc.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iterator>

namespace {

using Bytes = std::vector<uint8_t>;

void* Allocate(void*, size_t size) { return malloc(size); }
void Release(void*, void* address) { free(address); }
ISzAlloc s_Memory = {Allocate, Release};

struct Options {
    uint64_t inputs = 100'000;
    size_t size = 600;
    uint64_t seed = 1;
    std::vector<Bytes> files;
};

struct Counts {
    uint64_t blocks = 0, blocksAccepted = 0, streams = 0, streamsAccepted = 0;
};

// Runs of one byte, of noise, of few letters, copies from near and far, and pieces of files, one after another.
Bytes MakeData(LzmaRandom& random, size_t size, const std::vector<Bytes>& files) {
    Bytes data;
    while (data.size() < size) {
        size_t run = 1 + random.Below(1 + random.Below(static_cast<uint32_t>(size)));
        const uint8_t byte = static_cast<uint8_t>(random.Next());
        // Near, up to the whole of a dictionary, or anywhere.
        uint32_t distance = 1 + random.Below(20);
        if (random.OneIn(3)) distance = (4096u << random.Below(3)) - random.Below(20);
        if (random.OneIn(3)) distance = 1 + random.Below(100'000);
        const Bytes none;
        const Bytes& file = files.empty() ? none : files[random.Below(static_cast<uint32_t>(files.size()))];
        const uint32_t kind = random.Below(file.empty() ? 4 : 6);
        size_t place = kind >= 4 ? random.Below(static_cast<uint32_t>(file.size())) : 0;
        for (; run != 0 && data.size() < size; --run) {
            if (kind == 0)
                data.push_back(byte);
            else if (kind == 1)
                data.push_back(static_cast<uint8_t>(random.Next()));
            else if (kind == 2)
                data.push_back(static_cast<uint8_t>('a' + random.Below(1 + byte % 8)));
            else if (kind == 3)
                data.push_back(distance <= data.size() ? data[data.size() - distance] : byte);
            else
                data.push_back(file[place++ % file.size()]);
        }
    }
    return data;
}

// Properties and stream.
Bytes Encode(LzmaRandom& random, const Bytes& data) {
    CLzmaEncProps properties;
    LzmaEncProps_Init(&properties);
    properties.level = static_cast<int>(random.Below(10));
    properties.lc = static_cast<int>(random.Below(9));
    properties.lp = static_cast<int>(random.Below(5));
    // Large tables take all the time.
    const int most = random.OneIn(500) ? 12 : random.OneIn(20) ? 8 : 4;
    while (properties.lc + properties.lp > most) {
        properties.lc /= 2;
        properties.lp /= 2;
    }
    properties.pb = static_cast<int>(random.Below(5));
    properties.dictSize = 1u << (12 + random.Below(1 + random.Below(10)));
    properties.fb = static_cast<int>(5 + random.Below(269));
    properties.algo = static_cast<int>(random.Below(2));
    properties.numThreads = 1;
    LzmaEncProps_Normalize(&properties);

    Bytes stored(LZMA_PROPS_SIZE + data.size() + data.size() / 2 + 1000);
    SizeT size = stored.size() - LZMA_PROPS_SIZE, propertiesSize = LZMA_PROPS_SIZE;
    if (LzmaEncode(stored.data() + LZMA_PROPS_SIZE, &size, data.data(), data.size(), &properties, stored.data(),
                   &propertiesSize, static_cast<int>(random.Below(2)), nullptr, &s_Memory, &s_Memory) != SZ_OK) {
        fprintf(stderr, "the encoder failed\n");
        exit(2);
    }
    stored.resize(LZMA_PROPS_SIZE + size);
    return stored;
}

// One input of many: as it is, cut, with trailing bytes, with bits flipped, bytes changed, or other properties; and
// with a code that is not below the range, as no encoder makes it, which is where sign and size come apart.
Bytes Damage(LzmaRandom& random, const Bytes& whole) {
    Bytes stored = whole;
    const auto size = static_cast<uint32_t>(whole.size());
    const auto streamPlace = [&] { return LZMA_PROPS_SIZE + random.Below(size - LZMA_PROPS_SIZE); };
    switch (random.Below(10)) {
    case 0: break;
    case 1: stored.resize(LZMA_PROPS_SIZE + random.Below(size - LZMA_PROPS_SIZE)); break;
    case 2: stored.insert(stored.end(), 1 + random.Below(40), static_cast<uint8_t>(random.Next())); break;
    case 3: stored[streamPlace()] ^= static_cast<uint8_t>(1 << random.Below(8)); break;
    case 4:
        for (uint32_t flips = 1 + random.Below(6); flips != 0; --flips)
            stored[streamPlace()] ^= static_cast<uint8_t>(1 << random.Below(8));
        break;
    case 5: stored[streamPlace()] = static_cast<uint8_t>(random.Next()); break;
    case 6: {
        for (size_t place = streamPlace(); place < stored.size(); ++place)
            stored[place] = static_cast<uint8_t>(random.Next());
        break;
    }
    case 8:
        for (size_t place = LZMA_PROPS_SIZE + 1; place < std::min<size_t>(stored.size(), LZMA_PROPS_SIZE + 5); ++place)
            stored[place] = 0xFF;
        for (uint32_t flips = random.Below(4); flips != 0; --flips)
            stored[streamPlace()] = static_cast<uint8_t>(random.Next());
        break;
    case 9: // a smaller dictionary than the encoder's
        stored[2] = static_cast<uint8_t>(random.Below(64));
        stored[3] = stored[4] = 0;
        break;
    case 7:
        // Others of about the same size of table, or any, or none that is valid.
        if (random.OneIn(500))
            stored[0] = static_cast<uint8_t>(random.Next());
        else
            stored[0] = static_cast<uint8_t>((random.Below(5) * 5 + random.Below(3)) * 9 + random.Below(4));
        stored[2] = static_cast<uint8_t>(random.Below(64));
        stored[3] = stored[4] = 0;
        break;
    }
    return stored;
}

void PrintInput(const Bytes& stored) {
    fprintf(stderr, "input:");
    for (const uint8_t byte : stored)
        fprintf(stderr, " %02x", byte);
    fprintf(stderr, "\n");
}

// Decodes the input in one of the ways; returns false where the decoders differ.
bool CompareOnce(LzmaComparer& comparer, LzmaRandom& random, const Bytes& stored, size_t trueSize, size_t mostRoom,
                 Counts& counts) {
    size_t room = trueSize;
    if (random.OneIn(3)) room = random.Below(static_cast<uint32_t>(mostRoom) + 1);
    if (random.OneIn(6)) room = std::min(mostRoom, trueSize + 1 + random.Below(3));
    LzmaComparison comparison;
    if (random.OneIn(2)) {
        comparison = comparer.CompareBlock(stored, room, random.OneIn(2));
        ++counts.blocks;
        counts.blocksAccepted += comparison.isAccepted;
    } else {
        // Pieces of single bytes, or of a few, or of all.
        const auto most = [&](size_t all) {
            return 1 + (random.OneIn(3) ? all : random.Below(1u << random.Below(12)));
        };
        comparison = comparer.CompareStream(stored, room, most(stored.size()), most(room), random.OneIn(2), random);
        ++counts.streams;
        counts.streamsAccepted += comparison.isAccepted;
    }
    if (comparison.difference.empty()) return true;
    fprintf(stderr, "%s; room %zu\n", comparison.difference.c_str(), room);
    if (stored.size() < 2000) PrintInput(stored);
    return false;
}

bool Run(const Options& options) {
    const size_t mostRoom = options.size + options.size / 2 + 400;
    LzmaComparer comparer(options.size * 2 + 2000, mostRoom);
    Counts counts;
    for (uint64_t set = 0; counts.blocks + counts.streams < options.inputs; ++set) {
        LzmaRandom random(options.seed * 1'000'000'007 + set);
        const Bytes data = MakeData(random, random.Below(static_cast<uint32_t>(options.size) + 1), options.files);
        const Bytes whole = Encode(random, data);
        const int variants = options.size > 10'000 ? 20 : 300;
        for (int variant = 0; variant < variants && counts.blocks + counts.streams < options.inputs; ++variant) {
            const Bytes stored = variant < 4 ? whole : Damage(random, whole);
            if (CompareOnce(comparer, random, stored, data.size(), mostRoom, counts)) continue;
            fprintf(stderr, "seed %llu, set %llu, variant %d\n", static_cast<unsigned long long>(options.seed),
                    static_cast<unsigned long long>(set), variant);
            return false;
        }
    }
    printf("no difference: %llu blocks (%llu accepted), %llu streams (%llu accepted), seed %llu\n",
           static_cast<unsigned long long>(counts.blocks), static_cast<unsigned long long>(counts.blocksAccepted),
           static_cast<unsigned long long>(counts.streams), static_cast<unsigned long long>(counts.streamsAccepted),
           static_cast<unsigned long long>(options.seed));
    return true;
}

} // namespace

int main(int argumentCount, char** arguments) {
    Options options;
    for (int i = 1; i < argumentCount; ++i) {
        const bool hasValue = i + 1 < argumentCount;
        if (strcmp(arguments[i], "--inputs") == 0 && hasValue)
            options.inputs = strtoull(arguments[++i], nullptr, 10);
        else if (strcmp(arguments[i], "--size") == 0 && hasValue)
            options.size = std::min<size_t>(strtoull(arguments[++i], nullptr, 10), 1 << 24);
        else if (strcmp(arguments[i], "--seed") == 0 && hasValue)
            options.seed = strtoull(arguments[++i], nullptr, 10);
        else {
            std::ifstream file(arguments[i], std::ios::binary);
            if (!file) {
                fprintf(stderr, "can't read %s\n", arguments[i]);
                return 2;
            }
            options.files.emplace_back(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
        }
    }
    return Run(options) ? 0 : 1;
}
