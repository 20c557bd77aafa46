// dynamic_block_array: a sequence in blocks of BlockSize elements. Growing adds blocks and moves no element: each keeps
// its address for as long as the sequence lives. The process ends when memory is refused.
//
//   dynamic_block_array<FileEntryInfo, 32> files(kMemLabelFileList);
//   FileEntryInfo& file = files.emplace_back();
//
// A sequence belongs to one thread at a time.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/NonCopyable.h"

template <typename T, size_t BlockSize>
class dynamic_block_array : private NonCopyable {
public:
    // Blocks and elements get the label.
    explicit dynamic_block_array(MemLabelId label) : m_Size(0), m_Label(label), m_Blocks(label) {}
    ~dynamic_block_array() {
        for (Block*& block : m_Blocks) {
            Delete(block, m_Label);
            block = nullptr;
        }
    }

    size_t size() const { return m_Size; }
    bool empty() const { return m_Size == 0; }
    T& operator[](size_t index) { return (*m_Blocks[index / BlockSize])[index % BlockSize]; }
    const T& operator[](size_t index) const { return (*m_Blocks[index / BlockSize])[index % BlockSize]; }

    // The new element is value-initialised.
    T& emplace_back() {
        ++m_Size;
        grow(m_Size);
        return m_Blocks[(m_Size - 1) / BlockSize]->emplace_back();
    }

    // Makes room for newSize elements; the size stays.
    void grow(size_t newSize) {
        while (newSize > m_Blocks.size() * BlockSize) {
            Block* block = RequireMemory(New<Block>(m_Label, m_Label));
            m_Blocks.push_back(block);
            RequireMemory(block->reserve(BlockSize)); // a block with less room would move its elements when it grows
        }
    }

private:
    using Block = dynamic_array<T>;

    size_t m_Size;
    MemLabelId m_Label;
    dynamic_array<Block*> m_Blocks; // element i lies in block i / BlockSize at i % BlockSize
};
