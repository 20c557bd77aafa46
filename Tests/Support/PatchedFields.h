// A sink for the fields around an archive's data that gives them other values, and remembers where they lie. Private to
// the archive builder.
#pragma once

#include "Library/Writer/Frames.h"
#include "Tests/Support/ArchiveBuilder.h"

#include <map>
#include <set>
#include <string>

// What a description wants of the fields, and the names of all that have been put.
struct GivenFields {
    const ArchiveDescription& description;
    bool namesMatter = true; // false when no field is asked for by name, so that none need be remembered
    std::set<std::string> put = {};
};

class PatchedFields final : public FieldSink {
public:
    explicit PatchedFields(GivenFields& given) : m_Given(given) {}

    void PutNumber(const FieldName& name, UInt64 value, UInt32 size) override;
    void PutText(core::string_ref text) override { m_Bytes.append(text.data(), text.size()).push_back('\0'); }
    void PutBytes(const std::string& bytes) { m_Bytes += bytes; }
    void ResizeTo(UInt64 size) { m_Bytes.resize(size, '\0'); }

    // Appends another part with its fields.
    void PutPart(const PatchedFields& part);

    void PutFieldsAt(UInt64 offset, std::map<std::string, ArchiveField>* out) const;

    const std::string& Bytes() const { return m_Bytes; }
    UInt64 Size() const { return m_Bytes.size(); }

private:
    void Put(const FieldName& name, UInt64 value, UInt32 size);
    void PutLevel(const FieldName& name, UInt64 value);

    GivenFields& m_Given;
    std::string m_Bytes;
    std::map<std::string, ArchiveField> m_Fields;
};
