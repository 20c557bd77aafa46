#include "Tests/Support/PatchedFields.h"

namespace {

std::string NameOf(const FieldName& name) {
    if (name.list == nullptr) return name.field;
    return std::string(name.list) + "[" + std::to_string(name.index) + "]." + name.field;
}

// What readers must not look at, or must not take as it is, has odd values.
UInt64 MakeOdd(const FieldName& name, UInt64 value, const ArchiveDescription& description) {
    const std::string list = name.list != nullptr ? name.list : "", field = name.field;
    const bool isArchive = description.layout == ArchiveLayout::kArchive;
    if (list == "unused" && field != "word") return 0x5555555555555555;
    if (list == "unused") return isArchive ? name.index + 1 : 0x55AA55AA;
    // Only differences of the running values count.
    if (list == "running" && field == "uncompressed") return value + 1'000;
    if (list == "running" && field == "stored") return value + 5'000;
    if (field == "endType") return 4;
    if (field == "endStreamed") return 1;
    if (field == "levelBound" || field == "levelCount") return description.levelCount;
    return value;
}

} // namespace

void PatchedFields::PutNumber(const FieldName& name, UInt64 value, UInt32 size) {
    if (name.list != nullptr && name.list == std::string("level"))
        PutLevel(name, value);
    else
        Put(name, MakeOdd(name, value, m_Given.description), size);
}

// The level is the last of as many as are wanted, and the others are never read.
void PatchedFields::PutLevel(const FieldName& name, UInt64 value) {
    constexpr UInt64 kOther = 0x55AA55AA;
    const UInt32 count = m_Given.description.levelCount;
    const bool isFirstField = name.field == std::string("compressedSize");
    for (UInt32 level = 0; isFirstField && level + 1 < count; ++level) {
        Put({"compressedSize", "level", level}, kOther, 4);
        Put({"uncompressedSize", "level", level}, kOther, 4);
    }
    if (count != 0) Put({name.field, "level", count - 1}, value, 4);
}

void PatchedFields::Put(const FieldName& field, UInt64 value, UInt32 size) {
    if (m_Given.namesMatter) {
        const std::string name = NameOf(field);
        const auto given = m_Given.description.fields.find(name);
        if (given != m_Given.description.fields.end()) value = given->second;
        m_Given.put.insert(name);
        m_Fields[name] = {m_Bytes.size(), size};
    }
    for (UInt32 byte = 0; byte < size; ++byte)
        m_Bytes.push_back(static_cast<char>(value >> (8 * (size - 1 - byte))));
}

void PatchedFields::PutPart(const PatchedFields& part) {
    part.PutFieldsAt(m_Bytes.size(), &m_Fields);
    m_Bytes += part.m_Bytes;
}

void PatchedFields::PutFieldsAt(UInt64 offset, std::map<std::string, ArchiveField>* out) const {
    for (const auto& [name, field] : m_Fields)
        (*out)[name] = {offset + field.position, field.size};
}
