// Paths and globs that choose entries. Literal paths are looked up by hash: even with thousands of them, matching a
// path costs one look-up for each of its components. One thread at a time.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/NonCopyable.h"

struct zarvo_patterns : private NonCopyable {
    zarvo_code Add(core::string_ref text, Failure* failure);

    // As zarvo_patterns_match.
    int Match(core::string_ref path);

    size_t Count() const { return m_Patterns.size(); }
    bool IsUsed(size_t index) const { return m_Patterns[index].isUsed; }

private:
    static constexpr UInt32 kNone = ~UInt32{0};

    struct Pattern {
        explicit Pattern(MemLabelId label) : text(label) {}

        core::string text; // without leading and trailing characters that change nothing
        bool isUsed = false;
        UInt32 nextEqual = kNone; // an earlier pattern that names the same path
    };

    UInt32* FindSlot(UInt64 hash, core::string_ref path);
    [[nodiscard]] bool MakeRoomForLiteral();
    bool UseLiterals(core::string_ref path);

    dynamic_array<Pattern> m_Patterns;
    dynamic_array<UInt32> m_Globs; // those that hold anything but plain characters
    dynamic_array<UInt32> m_Slots; // all of them, by the hash of their normal forms as paths
    UInt32 m_Everything = kNone;   // the last one added whose normal form is empty
    core::string m_Normal{kMemLabelGeneral};
};
