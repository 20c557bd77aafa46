// Decodes LZMA: whole blocks by DecodeBlock, and streams in pieces of any size by Stream. The data is what archives
// hold: 5 bytes of properties, and the raw stream, whose size nothing in it tells.
//
// What a call does depends on where it leaves the stream. "Input" and "room" are what is left of them then:
//
//   where the stream is           room left              no room left, kFinishAny    no room left, kFinishHere
//   within a symbol, input used   kNeedsInput        kRoomFilled                 kNeedsInput
//   the next symbol is there      it is decoded          kRoomFilled                 kDamaged, but for a mark
//   at an end mark                kEnded             kRoomFilled                 kEnded
//   within a match                it is written on       kRoomFilled                 kDamaged
//   where it may end, as the      as above               kMayBeEnded                 kMayBeEnded
//     encoder's last byte is out
//
// So a stream without an end mark is whole when its known size has been produced, and kFinishHere holds it to that:
// the answer is then kMayBeEnded or kEnded. Bytes after the end are not looked at.
//
//   answer             consumed and produced                            afterwards
//   kRoomFilled    as far as the room reached                       more room, and more of the input
//   kMayBeEnded    as far as the room reached                       the same, or no more, where the size is known
//   kEnded         up to the end mark, it included                  answers the same
//   kNeedsInput    all input; up to 20 bytes of it are remembered   more input
//   kDamaged       produced: up to the broken symbol                nothing, until it is started again
//   kUnsupported   nothing                                          start with other properties
//   kNoMemory      nothing                                          start again
//
// Damage is found as soon as the symbol that shows it has been read whole: a distance that leads before the first byte
// or beyond the dictionary, an end mark that is not where the encoder's last byte is, a first byte that is not 0. Other
// damage yields wrong bytes. How many bytes come before damage does not depend on the pieces.
//
// Memory comes only from the caller's functions, and nothing throws. Any thread; a stream belongs to one thread at a
// time.
#pragma once

#include "Library/Lzma/SymbolLoop.h"

#include <cstddef>
#include <cstdint>

namespace lzma {

constexpr size_t kPropertiesSize = 5;

enum [[nodiscard]] Result : int{
    kRoomFilled,  kMayBeEnded, kEnded, kNeedsInput, kDamaged,
    kUnsupported, // no LZMA stream has these properties
    kNoMemory,
};

enum Finish : int {
    kFinishAny,  // more may follow the room
    kFinishHere, // the stream ends where the room does
};

enum History : int {
    // The stream keeps a dictionary of the size that the properties name, which may be 4 GiB. Output goes anywhere.
    kHistoryOwn,
    // All output goes to one piece of memory, each call's right after the last one's, and the caller does not change it
    // before the stream ends.
    kHistoryInOutput,
};

struct Memory {
    void* (*allocate)(void* context, size_t size); // aligned for any integer; null: there is none
    void (*release)(void* context, void* address); // of what allocate returned, never null
    void* context;
};

struct Answer {
    Result result;
    size_t consumed; // bytes of the input
    size_t produced; // bytes of output
};

// Decodes until the room is full or an end mark is met, whichever comes first; the properties are not counted as input.
// If the input ends before either, the result is kNeedsInput, and what its whole symbols decode to is produced.
// Allocates 2 bytes for each of 2,052 + 768 * 2^(lc + lp) probabilities: 16 KB for the usual lc = 3 and lp = 0, 6.3 MB
// at most.
Answer DecodeBlock(const void* properties, const void* input, size_t inputSize, void* output, size_t room,
                   const Memory& memory);

class Stream {
public:
    explicit Stream(const Memory& memory) : m_Memory(memory) {}
    ~Stream();
    Stream(const Stream&) = delete;
    Stream& operator=(const Stream&) = delete;

    // Starts a stream, at any time; properties are its kPropertiesSize bytes. Memory of the last stream is used
    // again where it is large enough. Answers kRoomFilled, kUnsupported or kNoMemory.
    Result Start(const void* properties, History history);

    // Bytes that it has allocated, and keeps.
    size_t MemoryUsed() const { return m_TableCapacity + m_DictionaryCapacity; }

    // Decodes as far as input and room reach. Both may be empty, and null then.
    Answer Decode(const void* input, size_t inputSize, void* output, size_t room, Finish finish);

private:
    struct Input {
        const uint8_t* data;
        size_t size;
    };

    Result DecodeTo(uint8_t* limit, Input& input, Finish finish);
    Result DecodeFromOutput(Input& input, uint8_t* output, size_t room, Finish finish, size_t& produced);
    Result DecodeOneSymbol(uint8_t* limit, Input& input, bool isMarkExpected);
    bool TakeFirstBytes(Input& input);
    void WritePending(uint8_t* limit);
    bool Reserve(void*& memory, size_t& capacity, size_t size);

    enum class Phase : uint8_t { kNotStarted, kBeforeFirstBytes, kWithin, kEnded, kFailed };

    Memory m_Memory;
    SymbolState m_Symbols = {};
    void* m_Table = nullptr;
    size_t m_TableCapacity = 0;
    void* m_Dictionary = nullptr;
    size_t m_DictionaryCapacity = 0;
    History m_History = kHistoryOwn;
    Phase m_Phase = Phase::kNotStarted;
    uint8_t m_HeadSize = 0;
    uint8_t m_Head[kLongestSymbol]; // the first bytes of a symbol, or of the stream, whose rest is still to come
};

} // namespace lzma
