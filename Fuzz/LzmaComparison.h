// Runs our LZMA decoder and the SDK's on the same input, and tells where they differ: in what is accepted, in the
// bytes, or in how many are consumed and produced. Input and output lie against pages that can't be touched.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <vector>

// Memory that ends, or begins, where a page that can't be touched begins or ends.
class GuardedMemory {
public:
    explicit GuardedMemory(size_t capacity);
    ~GuardedMemory();
    GuardedMemory(const GuardedMemory&) = delete;
    GuardedMemory& operator=(const GuardedMemory&) = delete;

    uint8_t* Last(size_t size) { return m_Begin + (m_Capacity - size); }
    uint8_t* First() { return m_Begin; }
    size_t Capacity() const { return m_Capacity; } // of whole pages

private:
    uint8_t* m_Begin;
    size_t m_Capacity;
};

// A small generator, for numbers that are the same everywhere.
class LzmaRandom {
public:
    explicit LzmaRandom(uint64_t seed) : m_State(seed * 2 + 1) {}
    uint32_t Next();
    uint32_t Below(uint32_t bound) { return static_cast<uint32_t>(uint64_t{Next()} * bound >> 32); }
    bool OneIn(uint32_t count) { return Below(count) == 0; }

private:
    uint64_t m_State;
};

// How a comparison ended, for the counts; where the decoders differ, difference says how.
struct LzmaComparison {
    std::string difference;
    bool isAccepted = false;
};

class LzmaComparer {
public:
    // For inputs and rooms up to these sizes.
    LzmaComparer(size_t mostInput, size_t mostRoom);

    // stored is properties and stream. At least 5 bytes.
    LzmaComparison CompareBlock(std::span<const uint8_t> stored, size_t room, bool isInputFirst);

    // The same data in pieces of input and room that random chooses, of up to these sizes, until size bytes are out,
    // the stream ends or fails, or nothing moves.
    LzmaComparison CompareStream(std::span<const uint8_t> stored, size_t size, size_t mostInputPiece,
                                 size_t mostRoomPiece, bool isHistoryInOutput, LzmaRandom& random);

private:
    GuardedMemory m_Input;
    GuardedMemory m_Output;
    std::vector<uint8_t> m_Expected;
};
