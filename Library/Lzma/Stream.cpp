// The stream: first bytes, symbols that are cut by the end of the input, matches that are cut by the end of the room,
// and the sliding window.
//
// The window is the caller's output as a whole, or a ring of our own. The ring is a little larger than the dictionary,
// so that a wide copy, which writes up to kWideCopy - 1 bytes more than it should, spoils only what is too far back to
// be reached. The memory goes on for as many bytes after the ring's end.
#include "Library/Lzma/Lzma.h"

#include <algorithm>
#include <cstring>

namespace lzma {

namespace {

constexpr size_t kFirstBytes = 5;
constexpr uint32_t kLeastDictionary = 4096; // less is raised to this
constexpr unsigned kPropertyValues = 9 * 5 * 5;

} // namespace

Stream::~Stream() {
    if (m_Table != nullptr) m_Memory.release(m_Memory.context, m_Table);
    if (m_Dictionary != nullptr) m_Memory.release(m_Memory.context, m_Dictionary);
}

bool Stream::Reserve(void*& memory, size_t& capacity, size_t size) {
    if (size <= capacity) return true;
    if (memory != nullptr) m_Memory.release(m_Memory.context, memory);
    memory = m_Memory.allocate(m_Memory.context, size);
    capacity = memory != nullptr ? size : 0;
    return memory != nullptr;
}

// offset  size  what
// 0       1     (pb * 5 + lp) * 9 + lc
// 1       4     size of the dictionary, the lowest byte first
Result Stream::Start(const void* properties, History history) {
    const auto* const bytes = static_cast<const uint8_t*>(properties);
    m_Phase = Phase::kNotStarted;
    if (bytes[0] >= kPropertyValues) return kUnsupported;
    const unsigned lc = bytes[0] % 9, lp = bytes[0] / 9 % 5, pb = bytes[0] / 9 / 5;
    const uint32_t dictionarySize =
        bytes[1] | uint32_t{bytes[2]} << 8 | uint32_t{bytes[3]} << 16 | uint32_t{bytes[4]} << 24;

    const size_t places = kLiteral + (size_t{kLiteralProbabilities} << (lc + lp));
    if (!Reserve(m_Table, m_TableCapacity, places * sizeof(Probability))) return kNoMemory;
    auto* const table = static_cast<Probability*>(m_Table);
    m_Symbols = {};
    m_Symbols.table = table;
    m_Symbols.literalContextBits = lc;
    m_Symbols.literalPositionMask = (1u << lp) - 1;
    m_Symbols.positionMask = (1u << pb) - 1;
    m_Symbols.dictionarySize = std::max(dictionarySize, kLeastDictionary);
    std::fill_n(m_Symbols.distances, 4, 1u);

    m_History = history;
    if (history == kHistoryOwn) {
        const uint64_t windowSize = uint64_t{m_Symbols.dictionarySize} + kWideCopy;
        if (windowSize + kWideCopy > SIZE_MAX) return kNoMemory;
        m_Symbols.windowSize = static_cast<size_t>(windowSize);
        if (!Reserve(m_Dictionary, m_DictionaryCapacity, m_Symbols.windowSize + kWideCopy)) return kNoMemory;
        m_Symbols.window = static_cast<uint8_t*>(m_Dictionary);
        m_Symbols.wideEnd = m_Symbols.window + m_Symbols.windowSize;
        m_Symbols.out = m_Symbols.window;
        m_Symbols.origin = reinterpret_cast<uintptr_t>(m_Symbols.out);
    }
    std::fill_n(table, places, kEvenChance);
    m_HeadSize = 0;
    m_Phase = Phase::kBeforeFirstBytes;
    return kRoomFilled;
}

// Returns whether all are there.
bool Stream::TakeFirstBytes(Input& input) {
    const size_t taken = std::min(kFirstBytes - m_HeadSize, input.size);
    if (taken != 0) memcpy(m_Head + m_HeadSize, input.data, taken);
    m_HeadSize = static_cast<uint8_t>(m_HeadSize + taken);
    input.data += taken;
    input.size -= taken;
    if (m_HeadSize < kFirstBytes) return false;
    m_Symbols.range = 0xFFFFFFFF;
    m_Symbols.code = uint32_t{m_Head[1]} << 24 | uint32_t{m_Head[2]} << 16 | uint32_t{m_Head[3]} << 8 | m_Head[4];
    m_HeadSize = 0;
    return true;
}

// What is left of the latest match.
void Stream::WritePending(uint8_t* limit) {
    for (; m_Symbols.pending != 0 && m_Symbols.out != limit; --m_Symbols.pending) {
        *m_Symbols.out = *FindMatch(m_Symbols, m_Symbols.out, m_Symbols.distances[0]);
        ++m_Symbols.out;
    }
}

// For where the next symbol may be cut, or has been: its bytes are put together first, and gone through.
Result Stream::DecodeOneSymbol(uint8_t* limit, Input& input, bool isMarkExpected) {
    uint8_t bytes[kLongestSymbol + 1] = {}; // one more, for the decoder to read before it knows
    const size_t taken = std::min(kLongestSymbol - m_HeadSize, input.size);
    memcpy(bytes, m_Head, m_HeadSize);
    if (taken != 0) memcpy(bytes + m_HeadSize, input.data, taken);
    const size_t size = m_HeadSize + taken;

    m_Symbols.in = bytes;
    const TrialResult trial = TrySymbol(m_Symbols, bytes + size);
    size_t used = taken;
    if (trial == kTrialNeedsInput) {
        memcpy(m_Head, bytes, size);
        m_HeadSize = static_cast<uint8_t>(size);
    } else {
        if (isMarkExpected && trial != kTrialMatch) return kDamaged;
        const SymbolResult symbol = lzma::DecodeSymbols(m_Symbols, bytes, limit);
        if (symbol == kSymbolsDamaged) return kDamaged;
        if (symbol == kSymbolsEndMark) m_Phase = Phase::kEnded;
        used = static_cast<size_t>(m_Symbols.in - bytes) - m_HeadSize;
        m_HeadSize = 0;
    }
    m_Symbols.in = nullptr; // bytes goes
    input.data += used;
    input.size -= used;
    return trial == kTrialNeedsInput ? kNeedsInput : kRoomFilled;
}

Result Stream::DecodeTo(uint8_t* limit, Input& input, Finish finish) {
    if (m_Phase == Phase::kBeforeFirstBytes) {
        if (!TakeFirstBytes(input)) return kNeedsInput;
        if (m_Head[0] != 0) return kDamaged;
        m_Phase = Phase::kWithin;
    }
    for (;;) {
        WritePending(limit);
        if (m_Phase == Phase::kEnded) return m_Symbols.code == 0 ? kEnded : kDamaged;
        const bool isFull = m_Symbols.out == limit;
        if (isFull) {
            if (m_Symbols.pending == 0 && m_Symbols.code == 0) return kMayBeEnded;
            if (finish == kFinishAny) return kRoomFilled;
            if (m_Symbols.pending != 0) return kDamaged;
        }
        if (m_HeadSize != 0 || input.size < kLongestSymbol + 1 || isFull) {
            const Result result = DecodeOneSymbol(limit, input, isFull);
            if (result != kRoomFilled) return result;
            continue;
        }
        m_Symbols.in = input.data;
        const uint8_t* const inEnd = input.data + input.size;
        const SymbolResult result = lzma::DecodeSymbols(m_Symbols, inEnd - kLongestSymbol - 1, limit);
        if (result == kSymbolsDamaged) return kDamaged;
        if (result == kSymbolsEndMark) m_Phase = Phase::kEnded;
        input.data = m_Symbols.in;
        input.size = static_cast<size_t>(inEnd - m_Symbols.in);
    }
}

Answer Stream::Decode(const void* input, size_t inputSize, void* output, size_t room, Finish finish) {
    if (m_Phase == Phase::kNotStarted || m_Phase == Phase::kFailed) return {kDamaged, 0, 0};
    Input left = {static_cast<const uint8_t*>(input), inputSize};
    auto* const bytes = static_cast<uint8_t*>(output);
    Result result;
    size_t produced = 0;
    if (m_History == kHistoryInOutput) {
        if (m_Symbols.out == nullptr) {
            m_Symbols.out = m_Symbols.window = bytes;
            m_Symbols.origin = reinterpret_cast<uintptr_t>(bytes);
        }
        uint8_t* const from = m_Symbols.out; // output itself, which may be null where there is no room
        m_Symbols.windowSize = static_cast<size_t>(from - m_Symbols.window) + room;
        m_Symbols.wideEnd = room < kWideCopy ? from : from + (room - (kWideCopy - 1));
        result = DecodeTo(from + room, left, finish);
        produced = static_cast<size_t>(m_Symbols.out - from);
    } else {
        for (;;) {
            uint8_t* const windowEnd = m_Symbols.window + m_Symbols.windowSize;
            if (m_Symbols.out == windowEnd) {
                m_Symbols.out = m_Symbols.window;
                m_Symbols.origin -= m_Symbols.windowSize;
            }
            uint8_t* const from = m_Symbols.out;
            const size_t span = std::min(room - produced, static_cast<size_t>(windowEnd - from));
            const bool isLastSpan = span == room - produced;
            result = DecodeTo(from + span, left, isLastSpan ? finish : kFinishAny);
            const size_t made = static_cast<size_t>(m_Symbols.out - from);
            if (made != 0) memcpy(bytes + produced, from, made);
            produced += made;
            // At the end of the ring, what looked like the end of the stream may not be.
            if (isLastSpan || (result != kRoomFilled && result != kMayBeEnded)) break;
        }
    }
    if (result == kDamaged) m_Phase = Phase::kFailed;
    return {result, inputSize - left.size, produced};
}

Answer DecodeBlock(const void* properties, const void* input, size_t inputSize, void* output, size_t room,
                   const Memory& memory) {
    if (inputSize < kFirstBytes) return {kNeedsInput, 0, 0}; // before memory is taken
    Stream stream(memory);
    const Result started = stream.Start(properties, kHistoryInOutput);
    if (started != kRoomFilled) return {started, 0, 0};
    return stream.Decode(input, inputSize, output, room, kFinishAny);
}

} // namespace lzma
