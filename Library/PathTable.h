// A hash table that finds items by the normal form of their paths. It holds only the items' numbers; its owner passes a
// callable pathOf, core::string_ref(UInt32 item), that knows their paths. A slot takes 8 bytes, and at most six
// sevenths of the slots are used.
//
// One thread at a time; any number of threads may call Get at once.
#pragma once

#include "Library/PathRules.h"
#include "Runtime/Core/Containers/DynamicArray.h"

class PathTable {
public:
    static constexpr UInt32 kNoItem = ~UInt32{0};

    // Makes room for count items, and keeps those in the table. Pointers that Find returned are no longer valid.
    [[nodiscard]] bool Reserve(size_t count) {
        const size_t wanted = count + count / 6 + 8;
        if (wanted <= m_Slots.size()) return true;
        dynamic_array<Slot> old = std::move(m_Slots);
        // A table that outgrows its size once leaves room for some more.
        if (!m_Slots.resize_uninitialized(old.empty() ? wanted : wanted + count / 4, kResizeExact)) return false;
        for (Slot& slot : m_Slots)
            slot.item = kNoItem;
        for (const Slot& slot : old)
            if (slot.item != kNoItem) *FirstFree(slot.hash) = slot;
        return true;
    }

    void Clear() { m_Slots = dynamic_array<Slot>(kMemLabelFileSystem); }

    // Points to the number of the item with that path. If there is no such item, it points to kNoItem in a free slot,
    // where the caller may store the item's number. The table must have room.
    template <typename PathOf>
    UInt32* Find(UInt64 hash, core::string_ref path, PathOf&& pathOf) {
        Slot& slot = m_Slots[IndexOf(hash, path, pathOf)];
        if (slot.item == kNoItem) slot.hash = static_cast<UInt32>(hash);
        return &slot.item;
    }

    // The item with that path, or kNoItem.
    template <typename PathOf>
    UInt32 Get(UInt64 hash, core::string_ref path, PathOf&& pathOf) const {
        return m_Slots.empty() ? kNoItem : m_Slots[IndexOf(hash, path, pathOf)].item;
    }

private:
    struct Slot {
        UInt32 hash;
        UInt32 item;
    };

    // The slot that is as far into the table as the hash is into its range.
    size_t StartOf(UInt32 hash) const { return static_cast<size_t>((UInt64{hash} * m_Slots.size()) >> 32); }
    size_t Next(size_t index) const { return index + 1 == m_Slots.size() ? 0 : index + 1; }

    // The index of the slot with the path's item, or of the free slot where the search for it ends.
    template <typename PathOf>
    size_t IndexOf(UInt64 hash, core::string_ref path, PathOf&& pathOf) const {
        const UInt32 shortHash = static_cast<UInt32>(hash);
        size_t index = StartOf(shortHash);
        for (; m_Slots[index].item != kNoItem; index = Next(index))
            if (m_Slots[index].hash == shortHash && IsSamePath(pathOf(m_Slots[index].item), path)) break;
        return index;
    }

    Slot* FirstFree(UInt32 hash) {
        size_t index = StartOf(hash);
        while (m_Slots[index].item != kNoItem)
            index = Next(index);
        return &m_Slots[index];
    }

    dynamic_array<Slot> m_Slots{kMemLabelFileSystem};
};
