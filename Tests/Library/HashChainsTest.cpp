// Our match finder beside the one that it stands in for.
#include "Library/Writer/HashChains.h"

#include "Tests/Library/CreationTest.h"

#include <cstdlib>
#include <gtest/gtest.h>
#include <memory>
#include <random>

namespace {

ISzAlloc s_Allocator = {[](void*, size_t size) { return malloc(size); }, [](void*, void* block) { free(block); }};

// A stream that gives a few bytes at a time.
struct Stream {
    explicit Stream(const std::string& data) : rest(data) {}

    ISeqInStream functions = {[](void* self, void* buffer, size_t* size) -> SRes {
        auto* const stream = static_cast<Stream*>(self);
        *size = std::min({*size, stream->rest.size(), size_t{1} + stream->random() % 30'000});
        stream->rest.copy(static_cast<char*>(buffer), *size);
        stream->rest.remove_prefix(*size);
        return SZ_OK;
    }};
    std::string_view rest;
    std::minstd_rand random;
};

struct Settings {
    UInt32 dictionary;
    UInt32 longestMatch;
    bool isStream;
};

class Finder {
public:
    Finder(const std::string& data, const Settings& settings, decltype(ChooseMatchFinder)* choose) : m_Stream(data) {
        MatchFinder_Construct(&m_Finder);
        m_Finder.btMode = 0;
        m_Finder.cutValue = 16;
        m_Finder.stream = &m_Stream.functions;
        if (!settings.isStream) {
            m_Finder.directInput = 1;
            m_Finder.bufferBase = reinterpret_cast<Byte*>(const_cast<char*>(data.data()));
            m_Finder.directInputRem = data.size();
        }
        EXPECT_EQ(1,
                  MatchFinder_Create(&m_Finder, settings.dictionary, 4'096, settings.longestMatch, 273, &s_Allocator));
        choose(&m_Finder, &m_Functions);
        m_Functions.Init(&m_Finder);
    }
    ~Finder() { MatchFinder_Free(&m_Finder, &s_Allocator); }

    UInt32 Available() { return m_Functions.GetNumAvailableBytes(&m_Finder); }
    void Skip(UInt32 count) { m_Functions.Skip(&m_Finder, count); }

    std::vector<UInt32> GetMatches() {
        std::vector<UInt32> pairs(2 * 274);
        pairs.resize(m_Functions.GetMatches(&m_Finder, pairs.data()));
        return pairs;
    }

private:
    Stream m_Stream;
    CMatchFinder m_Finder;
    IMatchFinder m_Functions;
};

// Text, noise and repeated bytes, and earlier parts again.
std::string MixedData(size_t size) {
    std::minstd_rand random;
    std::string data;
    while (data.size() < size) {
        const size_t length = 1 + random() % 3'000;
        switch (random() % 4) {
        case 0: data += SampleText(length); break;
        case 1: data += NoiseText(length); break;
        case 2: data.append(length, static_cast<char>(random())); break;
        default: data += data.substr(data.size() - std::min<size_t>(data.size(), random() % 100'000), length);
        }
    }
    return data;
}

TEST(HashChains, FindTheSameMatchesAsTheSdk) {
    const std::string data = MixedData(1'500'000); // a stream's window moves
    for (const Settings settings : {Settings{4'096, 32, false}, Settings{4'096, 32, true}, Settings{98'304, 5, true},
                                    Settings{1'048'576, 273, false}, Settings{2'097'152, 32, true}}) {
        SCOPED_TRACE(testing::Message() << "dictionary " << settings.dictionary << ", longest match "
                                        << settings.longestMatch << ", stream " << settings.isStream);
        Finder sdk(data, settings, MatchFinder_CreateVTable);
        Finder ours(data, settings, ChooseMatchFinder);
        std::minstd_rand random;
        UInt64 found = 0;
        while (sdk.Available() != 0) {
            ASSERT_EQ(sdk.Available(), ours.Available());
            if (random() % 4 == 0) {
                const UInt32 count = std::min(sdk.Available(), 1 + static_cast<UInt32>(random() % 272));
                sdk.Skip(count);
                ours.Skip(count);
            } else {
                const std::vector<UInt32> pairs = sdk.GetMatches();
                ASSERT_EQ(pairs, ours.GetMatches()) << sdk.Available() << " bytes before the end";
                found += pairs.size();
            }
        }
        EXPECT_EQ(0u, ours.Available());
        EXPECT_LT(10'000u, found);
    }
}

} // namespace
