// A program in C++ over zarvo.hpp, built with and without exceptions and type information: Wrapped SAMPLES
#include "Exercise.h"

#include <algorithm>
#include <zarvo.hpp>

namespace {

constexpr int kFailure = 7;

struct MemorySource final : zarvo::source {
    int64_t read_at(std::span<std::byte> buffer, uint64_t offset) override {
#ifdef __cpp_exceptions
        if (isFailing) throw kFailure;
#else
        if (isFailing) return -kFailure;
#endif
        const size_t count = std::min<uint64_t>(buffer.size(), bytes.size() - offset);
        memcpy(buffer.data(), bytes.data() + offset, count);
        return static_cast<int64_t>(count);
    }
    int64_t size() override { return static_cast<int64_t>(bytes.size()); }

    std::string bytes;
    bool isFailing = false;
};

constexpr int kRaw = 2; // the sample whose blocks are read whenever they are needed

// What a read that the source fails comes to: an errno, or the exception's value.
int FailureOf(zarvo::archive& archive, uint64_t index) {
    std::byte byte;
#ifdef __cpp_exceptions
    try {
        (void)archive.read(index, 0, {&byte, 1});
    } catch (int thrown) {
        return thrown;
    }
    return 0;
#else
    return archive.read(index, 0, {&byte, 1}).error.system_code();
#endif
}

} // namespace

int main(int argumentCount, char** arguments) {
    CHECK(argumentCount == 2);
    for (int number = 0; number < 4; ++number) {
        char* const path = SamplePath(arguments[1], number);
        size_t size = 0;
        char* const bytes = ReadFile(path, &size);
        auto owned = std::make_unique<MemorySource>();
        MemorySource* const source = owned.get();
        source->bytes.assign(bytes, size);
        zarvo::result<zarvo::archive> archive = zarvo::archive::open(std::move(owned), {.cache_bytes = 1});
        CHECK(archive);
        std::string table(1 << 20, '\0');
        for (const zarvo::entry entry : archive->entries()) {
            if (entry.path() != "tables/squares.csv") continue;
            zarvo::result<zarvo::stream> stream = archive->open_stream(entry.index());
            CHECK(stream);
            size_t count = 0;
            while (const size_t got = stream->read(std::as_writable_bytes(std::span(table).subspan(count))).count)
                count += got;
            CheckTable(table.data(), count);
        }
        source->isFailing = true;
        if (number == kRaw) CHECK(FailureOf(*archive, *archive->find("tables/squares.csv")) == kFailure);
        CHECK(!zarvo::archive::open(std::string(path) + ".none"));
        free(bytes);
        free(path);
    }
    return 0;
}
