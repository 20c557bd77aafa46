// Times LZMA decoders on the same data: the SDK's as four compilations, liblzma, 7zz and ours.
//   LzmaSpeed [--rounds N] FILE...
// Of each file at most 8 MiB are taken, packed by the SDK's encoder at level 5 and a dictionary of 8 MiB: as blocks of
// 128 KiB, which are decoded whole, and as one stream, decoded whole and in windows of 64 KiB. Decoders take turns, on
// one processor; a row gives each one's median of processor time in milliseconds a megabyte, and its part of the first
// one's.
#include "Library/Lzma/Lzma.h"

#include <lzma.h>
#include <lzma/LzmaDec.h>
#include <lzma/LzmaEnc.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <fstream>
#include <iterator>
#include <sched.h>
#include <span>
#include <string>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

// The SDK's decoder in other compilations; CMakeLists.txt names them.
extern "C" {
decltype(LzmaDecode) LzmaDecode_GccO3;
#ifdef VARNEX_WITH_CLANG
decltype(LzmaDecode) LzmaDecode_ClangO2, LzmaDecode_ClangO3;
#endif
}

namespace {

using Bytes = std::vector<uint8_t>;

constexpr size_t kMostData = 8 << 20;
constexpr size_t kBlock = 128 << 10;
constexpr size_t kWindow = 64 << 10;
constexpr size_t kAloneHeader = 13; // of liblzma's and 7zz's form of file: properties, and the size in 8 bytes

void* Allocate(void*, size_t size) { return malloc(size); }
void Release(void*, void* address) { free(address); }
ISzAlloc s_SdkMemory = {Allocate, Release};
const lzma::Memory kMemory = {Allocate, Release, nullptr};

// Properties, size and stream, and what comes of it.
struct Packed {
    Bytes stored;
    std::span<const uint8_t> plain;

    const uint8_t* Properties() const { return stored.data(); }
    const uint8_t* Stream() const { return stored.data() + kAloneHeader; }
    size_t StreamSize() const { return stored.size() - kAloneHeader; }
};

Packed Pack(std::span<const uint8_t> plain) {
    CLzmaEncProps properties;
    LzmaEncProps_Init(&properties);
    properties.dictSize = kMostData;
    Packed packed = {Bytes(kAloneHeader + plain.size() + plain.size() / 2 + 1000), plain};
    SizeT size = packed.stored.size() - kAloneHeader, propertiesSize = LZMA_PROPS_SIZE;
    if (LzmaEncode(packed.stored.data() + kAloneHeader, &size, plain.data(), plain.size(), &properties,
                   packed.stored.data(), &propertiesSize, 0, nullptr, &s_SdkMemory, &s_SdkMemory) != SZ_OK) {
        fprintf(stderr, "the encoder failed\n");
        exit(2);
    }
    packed.stored.resize(kAloneHeader + size);
    const uint64_t plainSize = plain.size();
    memcpy(packed.stored.data() + LZMA_PROPS_SIZE, &plainSize, sizeof(plainSize));
    return packed;
}

template <decltype(LzmaDecode)& kDecode>
size_t DecodeWithSdk(const Packed& packed, uint8_t* output) {
    SizeT produced = packed.plain.size(), consumed = packed.StreamSize();
    ELzmaStatus status;
    const SRes result = kDecode(output, &produced, packed.Stream(), &consumed, packed.Properties(), LZMA_PROPS_SIZE,
                                LZMA_FINISH_ANY, &status, &s_SdkMemory);
    return result == SZ_OK ? produced : 0;
}

size_t DecodeWithOurs(const Packed& packed, uint8_t* output) {
    const lzma::Answer answer = lzma::DecodeBlock(packed.Properties(), packed.Stream(), packed.StreamSize(), output,
                                                  packed.plain.size(), kMemory);
    return answer.produced;
}

size_t DecodeWithLiblzma(const Packed& packed, uint8_t* output) {
    lzma_stream stream = LZMA_STREAM_INIT;
    if (lzma_alone_decoder(&stream, UINT64_MAX) != LZMA_OK) return 0;
    stream.next_in = packed.stored.data();
    stream.avail_in = packed.stored.size();
    stream.next_out = output;
    stream.avail_out = packed.plain.size();
    const lzma_ret result = lzma_code(&stream, LZMA_FINISH);
    const size_t produced = result == LZMA_OK || result == LZMA_STREAM_END ? stream.total_out : 0;
    lzma_end(&stream);
    return produced;
}

size_t DecodeWindowsWithSdk(const Packed& packed, uint8_t* output) {
    CLzmaDec decoder;
    LzmaDec_Construct(&decoder);
    if (LzmaDec_Allocate(&decoder, packed.Properties(), LZMA_PROPS_SIZE, &s_SdkMemory) != SZ_OK) return 0;
    LzmaDec_Init(&decoder);
    size_t consumed = 0, produced = 0;
    while (produced < packed.plain.size()) {
        SizeT taken = packed.StreamSize() - consumed, made = std::min(kWindow, packed.plain.size() - produced);
        ELzmaStatus status;
        if (LzmaDec_DecodeToBuf(&decoder, output + produced, &made, packed.Stream() + consumed, &taken, LZMA_FINISH_ANY,
                                &status) != SZ_OK ||
            made == 0)
            break;
        consumed += taken;
        produced += made;
    }
    LzmaDec_Free(&decoder, &s_SdkMemory);
    return produced;
}

template <lzma::History kHistory>
size_t DecodeWindowsWithOurs(const Packed& packed, uint8_t* output) {
    lzma::Stream stream(kMemory);
    if (stream.Start(packed.Properties(), kHistory) != lzma::kRoomFilled) return 0;
    size_t consumed = 0, produced = 0;
    while (produced < packed.plain.size()) {
        const lzma::Answer answer =
            stream.Decode(packed.Stream() + consumed, packed.StreamSize() - consumed, output + produced,
                          std::min(kWindow, packed.plain.size() - produced), lzma::kFinishAny);
        if (answer.produced == 0) break;
        consumed += answer.consumed;
        produced += answer.produced;
    }
    return produced;
}

double Seconds(const timeval& time) {
    return static_cast<double>(time.tv_sec) + 1e-6 * static_cast<double>(time.tv_usec);
}

double ProcessorSeconds() {
    timespec time;
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + 1e-9 * static_cast<double>(time.tv_nsec);
}

// Processor time of 7zz on the file, or less than 0 where there is no 7zz.
double RunSevenZip(const std::string& path) {
    const pid_t child = fork();
    if (child == 0) {
        const int null = open("/dev/null", O_RDWR);
        dup2(null, STDOUT_FILENO);
        dup2(null, STDERR_FILENO);
        execlp("7zz", "7zz", "t", "-mmt=1", path.c_str(), nullptr);
        _exit(127);
    }
    int status = 0;
    rusage usage = {};
    if (child < 0 || wait4(child, &status, 0, &usage) != child || status != 0) return -1;
    return Seconds(usage.ru_utime) + Seconds(usage.ru_stime);
}

// A file of the temporary folder, for as long as this lives.
struct AloneFile {
    explicit AloneFile(const Packed& packed) {
        const char* const folder = getenv("TMPDIR");
        path = std::string(folder != nullptr ? folder : "/tmp") + "/LzmaSpeed-" + std::to_string(getpid()) + "-" +
               std::to_string(packed.plain.size()) + ".lzma";
        std::ofstream(path, std::ios::binary)
            .write(reinterpret_cast<const char*>(packed.stored.data()),
                   static_cast<std::streamsize>(packed.stored.size()));
    }
    ~AloneFile() { unlink(path.c_str()); }
    AloneFile(const AloneFile&) = delete;
    AloneFile& operator=(const AloneFile&) = delete;

    std::string path;
};

struct Decoder {
    const char* name;
    size_t (*decode)(const Packed& packed, uint8_t* output);
};

constexpr Decoder kWhole[] = {
    {"LzmaDec gcc -O2", DecodeWithSdk<LzmaDecode>},
    {"LzmaDec gcc -O3", DecodeWithSdk<LzmaDecode_GccO3>},
#ifdef VARNEX_WITH_CLANG
    {"LzmaDec clang -O2", DecodeWithSdk<LzmaDecode_ClangO2>},
    {"LzmaDec clang -O3", DecodeWithSdk<LzmaDecode_ClangO3>},
#endif
    {"liblzma", DecodeWithLiblzma},
    {"ours", DecodeWithOurs},
};

constexpr Decoder kInWindows[] = {
    {"LzmaDec gcc -O2", DecodeWindowsWithSdk},
    {"ours", DecodeWindowsWithOurs<lzma::kHistoryOwn>},
    {"ours in output", DecodeWindowsWithOurs<lzma::kHistoryInOutput>},
};

double Median(std::vector<double> times) {
    std::sort(times.begin(), times.end());
    return times[times.size() / 2];
}

void PrintRow(const char* name, double seconds, double first, size_t size) {
    printf("  %-18s %8.2f ms/MB  %5.3f\n", name, seconds * 1e9 / static_cast<double>(size), seconds / first);
}

void Compare(std::span<const Decoder> decoders, const std::vector<Packed>& all, int rounds, bool isSevenZipAsked) {
    std::vector<std::vector<double>> times(decoders.size() + 1);
    size_t size = 0;
    for (const Packed& packed : all)
        size += packed.plain.size();
    Bytes output(kMostData);
    const Packed empty = Pack({});
    const AloneFile file(all.front()), emptyFile(empty);
    for (int round = 0; round < rounds; ++round) {
        for (size_t i = 0; i < decoders.size(); ++i) {
            const double start = ProcessorSeconds();
            for (const Packed& packed : all) {
                const size_t produced = decoders[i].decode(packed, output.data());
                if (round != 0 && produced == packed.plain.size()) continue;
                if (produced != packed.plain.size() || memcmp(output.data(), packed.plain.data(), produced) != 0) {
                    fprintf(stderr, "%s decodes wrongly\n", decoders[i].name);
                    exit(1);
                }
            }
            if (round != 0) times[i].push_back(ProcessorSeconds() - start); // the first compares, and warms up
        }
        if (isSevenZipAsked && round != 0) times.back().push_back(RunSevenZip(file.path) - RunSevenZip(emptyFile.path));
    }
    const double first = Median(times[0]);
    for (size_t i = 0; i < decoders.size(); ++i)
        PrintRow(decoders[i].name, Median(times[i]), first, size);
    if (isSevenZipAsked) PrintRow("7zz -mmt=1", Median(times.back()), first, size);
}

} // namespace

int main(int argumentCount, char** arguments) {
    cpu_set_t processors;
    CPU_ZERO(&processors);
    CPU_SET(static_cast<size_t>(std::max(0, sched_getcpu())), &processors);
    sched_setaffinity(0, sizeof(processors), &processors);

    int rounds = 15;
    for (int i = 1; i < argumentCount; ++i) {
        if (strcmp(arguments[i], "--rounds") == 0 && i + 1 < argumentCount) {
            rounds = std::max(2, atoi(arguments[++i]));
            continue;
        }
        std::ifstream stream(arguments[i], std::ios::binary);
        Bytes data{std::istreambuf_iterator<char>(stream), std::istreambuf_iterator<char>()};
        data.resize(std::min(data.size(), kMostData));
        if (data.empty()) {
            fprintf(stderr, "nothing to read in %s\n", arguments[i]);
            return 2;
        }
        std::vector<Packed> blocks;
        for (size_t place = 0; place < data.size(); place += kBlock)
            blocks.push_back(Pack(std::span(data).subspan(place, std::min(kBlock, data.size() - place))));
        const std::vector<Packed> whole = {Pack(data)};
        printf("%s, %zu bytes, packed to %.3f\n", arguments[i], data.size(),
               static_cast<double>(whole[0].StreamSize()) / static_cast<double>(data.size()));
        printf(" blocks of 128 KiB\n");
        Compare(kWhole, blocks, rounds, false);
        printf(" one stream\n");
        Compare(kWhole, whole, rounds, true);
        printf(" one stream in windows of 64 KiB\n");
        Compare(kInWindows, whole, rounds, false);
        fflush(stdout);
    }
    return 0;
}
