#include "Fuzz/LzmaComparison.h"
#include "Library/Lzma/Lzma.h"

#include <lzma/LzmaDec.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <sys/mman.h>
#include <unistd.h>

using namespace lzma;

namespace {

constexpr uint8_t kUntouched = 0xA5;
constexpr size_t kWatched = 64; // bytes behind a room that are looked at after each call

void* SdkAllocate(void*, size_t size) { return malloc(size); }
void SdkRelease(void*, void* address) { free(address); }
ISzAlloc s_SdkMemory = {SdkAllocate, SdkRelease};

const Memory kOurMemory = {[](void*, size_t size) { return malloc(size); }, [](void*, void* address) { free(address); },
                           nullptr};

// What the SDK's answer is in our words; SZ_OK goes by its status.
Result Translate(SRes result, ELzmaStatus status) {
    switch (result) {
    case SZ_OK: break;
    case SZ_ERROR_UNSUPPORTED: return kUnsupported;
    case SZ_ERROR_INPUT_EOF: return kNeedsInput;
    case SZ_ERROR_MEM: return kNoMemory;
    default: return kDamaged;
    }
    switch (status) {
    case LZMA_STATUS_NOT_FINISHED: return kRoomFilled;
    case LZMA_STATUS_MAYBE_FINISHED_WITHOUT_MARK: return kMayBeEnded;
    case LZMA_STATUS_FINISHED_WITH_MARK: return kEnded;
    case LZMA_STATUS_NEEDS_MORE_INPUT: return kNeedsInput;
    default: return kDamaged;
    }
}

bool HasBytes(Result result) { return result <= kNeedsInput; }

std::string Describe(const Answer& answer) {
    return "answer " + std::to_string(answer.result) + ", consumed " + std::to_string(answer.consumed) + ", produced " +
           std::to_string(answer.produced);
}

std::string FindDifference(const Answer& expected, const uint8_t* expectedBytes, const Answer& answer,
                           const uint8_t* bytes, size_t room, size_t watched) {
    if (expected.result != answer.result || expected.consumed != answer.consumed ||
        expected.produced != answer.produced)
        return "expected " + Describe(expected) + "; " + Describe(answer);
    if (answer.produced != 0 && memcmp(expectedBytes, bytes, answer.produced) != 0) return "other bytes";
    for (size_t i = 0; i < watched; ++i)
        if (bytes[room + i] != kUntouched) return "written behind the room, at " + std::to_string(i);
    return {};
}

} // namespace

GuardedMemory::GuardedMemory(size_t capacity) {
    const size_t page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    m_Capacity = (capacity + page - 1) / page * page;
    void* const all = mmap(nullptr, m_Capacity + 2 * page, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (all == MAP_FAILED || mprotect(static_cast<uint8_t*>(all) + page, m_Capacity, PROT_READ | PROT_WRITE) != 0) {
        perror("guarded memory");
        abort();
    }
    m_Begin = static_cast<uint8_t*>(all) + page;
}

GuardedMemory::~GuardedMemory() {
    const size_t page = static_cast<size_t>(sysconf(_SC_PAGESIZE));
    munmap(m_Begin - page, m_Capacity + 2 * page);
}

uint32_t LzmaRandom::Next() {
    m_State = m_State * 6364136223846793005 + 1442695040888963407;
    const auto mixed = static_cast<uint32_t>((m_State >> 18 ^ m_State) >> 27);
    const auto turn = static_cast<uint32_t>(m_State >> 59);
    return mixed >> turn | mixed << (32 - turn) % 32;
}

LzmaComparer::LzmaComparer(size_t mostInput, size_t mostRoom) : m_Input(mostInput), m_Output(mostRoom + kWatched) {
    m_Expected.resize(mostRoom + kWatched);
}

LzmaComparison LzmaComparer::CompareBlock(std::span<const uint8_t> stored, size_t room, bool isInputFirst) {
    const uint8_t* const properties = stored.data();
    const std::span<const uint8_t> stream = stored.subspan(kPropertiesSize);
    uint8_t* const input = isInputFirst ? m_Input.First() : m_Input.Last(stream.size());
    if (!stream.empty()) memcpy(input, stream.data(), stream.size());
    uint8_t* const output = isInputFirst ? m_Output.First() : m_Output.Last(room);
    const size_t watched = isInputFirst ? kWatched : 0;
    memset(output + room, kUntouched, watched);

    SizeT consumed = stream.size(), produced = room;
    ELzmaStatus status = LZMA_STATUS_NOT_SPECIFIED;
    const SRes result = LzmaDecode(m_Expected.data(), &produced, input, &consumed, properties, LZMA_PROPS_SIZE,
                                   LZMA_FINISH_ANY, &status, &s_SdkMemory);
    Answer expected = {Translate(result, status), consumed, produced};
    const Answer answer = DecodeBlock(properties, input, stream.size(), output, room, kOurMemory);
    if (result != SZ_OK && expected.result == answer.result) {
        // The SDK does not say how much of broken data there is, but decodes as much where it is asked for no more.
        expected.consumed = answer.consumed;
        consumed = stream.size();
        produced = answer.produced;
        const SRes prefix = LzmaDecode(m_Expected.data(), &produced, input, &consumed, properties, LZMA_PROPS_SIZE,
                                       LZMA_FINISH_ANY, &status, &s_SdkMemory);
        expected.produced = prefix == SZ_OK || answer.produced == 0 ? answer.produced : 0;
    }
    return {FindDifference(expected, m_Expected.data(), answer, output, room, watched), result == SZ_OK};
}

LzmaComparison LzmaComparer::CompareStream(std::span<const uint8_t> stored, size_t size, size_t mostInputPiece,
                                           size_t mostRoomPiece, bool isHistoryInOutput, LzmaRandom& random) {
    Stream ours(kOurMemory);
    CLzmaDec sdk;
    LzmaDec_Construct(&sdk);
    const Result expectedStart =
        Translate(LzmaDec_Allocate(&sdk, stored.data(), LZMA_PROPS_SIZE, &s_SdkMemory), LZMA_STATUS_NOT_FINISHED);
    const Result start = ours.Start(stored.data(), isHistoryInOutput ? kHistoryInOutput : kHistoryOwn);
    LzmaComparison comparison;
    if (start != expectedStart)
        comparison.difference = "start: expected " + std::to_string(expectedStart) + "; " + std::to_string(start);
    if (start != kRoomFilled || expectedStart != kRoomFilled) {
        LzmaDec_Free(&sdk, &s_SdkMemory);
        return comparison;
    }
    LzmaDec_Init(&sdk);

    uint8_t* const whole = m_Output.Last(size);
    std::span<const uint8_t> left = stored.subspan(kPropertiesSize);
    size_t written = 0;
    int idle = 0;
    for (size_t step = 0; idle < 8; ++step) {
        const size_t piece = std::min(left.size(), size_t{random.Below(static_cast<uint32_t>(mostInputPiece) + 1)});
        const size_t room = std::min(size - written, size_t{random.Below(static_cast<uint32_t>(mostRoomPiece) + 1)});
        const bool isEnd = room == size - written ? !random.OneIn(4) : random.OneIn(200);
        uint8_t* const input = m_Input.Last(piece);
        if (piece != 0) memcpy(input, left.data(), piece);
        // Output of its own goes to the end of the memory too; the bytes behind others are watched.
        uint8_t* const output = isHistoryInOutput ? whole + written : m_Output.Last(room);
        const size_t watched = isHistoryInOutput ? std::min(kWatched, size - written - room) : 0;
        memset(output + room, kUntouched, watched); // a larger room of an earlier step may have reached there

        SizeT consumed = piece, produced = room;
        ELzmaStatus status = LZMA_STATUS_NOT_SPECIFIED;
        const SRes result = LzmaDec_DecodeToBuf(&sdk, m_Expected.data(), &produced, input, &consumed,
                                                isEnd ? LZMA_FINISH_END : LZMA_FINISH_ANY, &status);
        Answer expected = {Translate(result, status), consumed, produced};
        const Answer answer =
            ours.Decode(piece != 0 || random.OneIn(2) ? input : nullptr, piece,
                        room != 0 || random.OneIn(2) ? output : nullptr, room, isEnd ? kFinishHere : kFinishAny);
        // After damage the SDK's bytes and counts depend on the pieces.
        if (result != SZ_OK) expected = {expected.result, answer.consumed, 0};
        const Answer counted = result == SZ_OK ? answer : Answer{answer.result, answer.consumed, 0};
        comparison.difference = FindDifference(expected, m_Expected.data(), counted, output, room, watched);
        if (!comparison.difference.empty()) {
            comparison.difference += ", in step " + std::to_string(step) + " at " + std::to_string(written) + " with " +
                                     std::to_string(piece) + " into " + std::to_string(room) +
                                     (isEnd ? ", the end" : "");
            break;
        }
        comparison.isAccepted = HasBytes(answer.result);
        if (!comparison.isAccepted) break;
        left = left.subspan(answer.consumed);
        written += answer.produced;
        idle = answer.consumed == 0 && answer.produced == 0 ? idle + 1 : 0;
    }
    LzmaDec_Free(&sdk, &s_SdkMemory);
    return comparison;
}
