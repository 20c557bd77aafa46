#include "Tests/Tools/Extractor/ExtractorTest.h"

namespace {

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
constexpr bool kIsSanitized = true;
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
constexpr bool kIsSanitized = true;
#else
constexpr bool kIsSanitized = false;
#endif
#else
constexpr bool kIsSanitized = false;
#endif

// Every field of every layout takes every value at which a sum, a sign or a width ends. Whatever the command makes of
// it, it ends by itself, with one of its two statuses, without much memory, and makes nothing outside its output
// folder.
TEST(HostileValues, InAnyFieldAreSurvived) {
    struct {
        ArchiveLayout layout;
        CompressionType sectionType;
        bool atEnd;
    } const forms[] = {
        {ArchiveLayout::kBlockBased, kCompressionNone, false}, {ArchiveLayout::kWebVersion6, kCompressionLzma, true},
        {ArchiveLayout::kWeb, kCompressionNone, false},        {ArchiveLayout::kRaw, kCompressionNone, false},
        {ArchiveLayout::kArchive, kCompressionNone, true},
    };
    const UInt64 values[] = {
        0, 1, 0x7FFF'FFFF, 0x8000'0000, 0xFFFF'FFFF, 0x7FFF'FFFF'FFFF'FFFF, 0x8000'0000'0000'0000, ~UInt64{0}};
    for (const auto& form : forms) {
        ArchiveDescription archive;
        archive.layout = form.layout;
        archive.sectionType = form.sectionType;
        archive.sectionAtEnd = form.atEnd;
        archive.type = kCompressionLzma;
        archive.streamed = true;
        archive.chunkSize = 70'000;
        archive.entries = {{.path = "a.bin", .bytes = Compressible(70'000)}, {.path = "b.txt", .bytes = "text"}};
        const BuiltArchive built = BuildArchive(archive);
        for (const auto& [name, field] : built.fields) {
            for (const UInt64 value : values) {
                if (field.size < 8 && value > 0xFFFF'FFFF) continue;
                SCOPED_TRACE(testing::Message() << "layout " << static_cast<int>(form.layout) << ", kind "
                                                << form.sectionType << ", " << name << " = " << value);
                archive.fields = {{name, value}};
                long peakKilobytes = 0;
                const Outcome outcome = Extract(BuildArchive(archive).bytes, {.peakKilobytes = &peakKilobytes});
                EXPECT_TRUE(outcome.transcript.status == 0 || outcome.transcript.status == 1) << outcome.transcript;
                EXPECT_EQ("", outcome.transcript.error);
                EXPECT_EQ(outcome.transcript.status == 0, outcome.transcript.output.ends_with(kAllOk));
                for (const auto& [path, content] : outcome.tree)
                    EXPECT_TRUE(path == "a.zarvo_data" || path.starts_with("a.zarvo_data/")) << path;
                if (!kIsSanitized) {
                    EXPECT_LE(peakKilobytes, 64 * 1'024);
                }
            }
        }
    }
}

} // namespace
