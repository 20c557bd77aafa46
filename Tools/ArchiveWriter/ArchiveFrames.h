// What the archive writer puts around an archive's data: named fields, and the tables of the layouts. Private to the
// writer.
#pragma once

#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <map>
#include <set>
#include <string>
#include <vector>

// The values that a description gives to fields, and the names of all fields that have been stored.
struct GivenFields {
    const std::map<std::string, UInt64>& values;
    bool namesMatter = true; // false when no field is asked for by name, so that none need be remembered
    std::set<std::string> stored = {};
};

// Big-endian fields and texts, one after another. A value in given replaces the writer's.
class FieldWriter {
public:
    explicit FieldWriter(GivenFields& given) : m_Given(given) {}

    void Put16(const std::string& name, UInt64 value) { Put(name, 2, value); }
    void Put32(const std::string& name, UInt64 value) { Put(name, 4, value); }
    void Put64(const std::string& name, UInt64 value) { Put(name, 8, value); }
    void PutText(const std::string& text) { m_Bytes.append(text).push_back('\0'); }
    void PutBytes(const std::string& bytes) { m_Bytes += bytes; }
    void ResizeTo(UInt64 size) { m_Bytes.resize(size, '\0'); }

    // Appends another part with its fields.
    void PutPart(const FieldWriter& part) {
        for (const auto& [name, field] : part.m_Fields)
            m_Fields[name] = {m_Bytes.size() + field.position, field.size};
        m_Bytes += part.m_Bytes;
    }

    void PutFieldsAt(UInt64 offset, std::map<std::string, ArchiveField>* out) const {
        for (const auto& [name, field] : m_Fields)
            (*out)[name] = {offset + field.position, field.size};
    }

    const std::string& Bytes() const { return m_Bytes; }
    UInt64 Size() const { return m_Bytes.size(); }

private:
    void Put(const std::string& name, UInt32 size, UInt64 value) {
        if (m_Given.namesMatter) {
            const auto given = m_Given.values.find(name);
            if (given != m_Given.values.end()) value = given->second;
            m_Given.stored.insert(name);
            m_Fields[name] = {m_Bytes.size(), size};
        }
        for (UInt32 byte = 0; byte < size; ++byte)
            m_Bytes.push_back(static_cast<char>(value >> (8 * (size - 1 - byte))));
    }

    GivenFields& m_Given;
    std::string m_Bytes;
    std::map<std::string, ArchiveField> m_Fields;
};

struct PlacedNode {
    const ArchiveEntry* entry;
    UInt64 offset;
    UInt64 size;
};

// What comes before and after the data.
struct Frame {
    FieldWriter head;
    FieldWriter tail;
    UInt64 headerSize = 0;
    UInt64 sectionOffset = 0;
    UInt64 sectionSize = 0;
};

// The directory at the start of the legacy layouts' data stream.
FieldWriter MakeLegacyDirectory(GivenFields& given, const std::vector<PlacedNode>& nodes);

Frame MakeFrame(const ArchiveDescription& description, GivenFields& given, const std::vector<StoredBlock>& blocks,
                const std::vector<PlacedNode>& nodes);

inline bool HasLegacyDirectory(ArchiveLayout layout) {
    return layout == ArchiveLayout::kWeb || layout == ArchiveLayout::kRaw;
}
