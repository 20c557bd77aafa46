// Reads every file of an archive in several threads, and prints "checksum  path" in the archive's order:
// ReadInThreads ARCHIVE
#include <zarvo.hpp>

#include <atomic>
#include <cstdio>
#include <thread>
#include <vector>

namespace {

struct Sum {
    uint64_t value = 0xcbf29ce484222325; // FNV-1a
    zarvo::error error = {};
};

Sum SumFile(zarvo::archive& archive, uint64_t index) {
    Sum sum;
    std::vector<std::byte> piece(65'536);
    for (uint64_t offset = 0;;) {
        zarvo::read_result read = archive.read(index, offset, piece);
        for (const std::byte byte : std::span(piece).first(read.count))
            sum.value = (sum.value ^ std::to_integer<uint64_t>(byte)) * 0x100000001b3;
        offset += read.count;
        sum.error = std::move(read.error);
        if (sum.error || read.count == 0) return sum;
    }
}

} // namespace

int main(int argumentCount, char** arguments) {
    if (argumentCount != 2) {
        fprintf(stderr, "Usage: ReadInThreads ARCHIVE\n");
        return 2;
    }
    auto archive = zarvo::archive::open(arguments[1]);
    if (!archive) {
        fprintf(stderr, "%s: %s\n", arguments[1], archive.error().text().data());
        return 1;
    }
    std::vector<Sum> sums(archive->entries().size());
    std::atomic<size_t> next = 0; // the entry that no thread has taken yet
    {
        std::vector<std::jthread> threads(4);
        for (std::jthread& thread : threads)
            thread = std::jthread([&] {
                for (size_t index; (index = next++) < sums.size();)
                    sums[index] = SumFile(*archive, index);
            });
    }
    int status = 0;
    for (const zarvo::entry entry : archive->entries()) {
        const Sum& sum = sums[entry.index()];
        if (sum.error) {
            fprintf(stderr, "%s: %s\n", entry.path().data(), sum.error.text().data());
            status = 1;
        } else if (entry.is_file()) {
            printf("%016llx  %s\n", static_cast<unsigned long long>(sum.value), entry.path().data());
        }
    }
    return fflush(stdout) == 0 && ferror(stdout) == 0 ? status : 1;
}
