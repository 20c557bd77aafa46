#include "Tests/Tools/Zarvo/ZarvoTest.h"

namespace {

class ZarvoInfo : public ZarvoTest {};

TEST_F(ZarvoInfo, PrintsAnObjectAnArchiveAsJson) {
    ArchiveDescription archive = Archive("a:z40000 d| a:x");
    archive.blocks = {{.size = 100, .type = kCompressionNone}, {.size = 30'000, .type = kCompressionLzma}};
    archive.type = kCompressionLz4;
    archive.chunkSize = 20'000;
    archive.engineVersion = "5.\xFFx";
    const BuiltArchive built = BuildArchive(archive);
    WriteFile("a.zarvo", built.bytes);
    UInt64 stored = 0;
    for (int index = 0; index < 3; ++index) {
        const ArchiveField& field = built.fields.at("block[" + std::to_string(index) + "].compressedSize");
        for (UInt32 byte = 0; byte < field.size; ++byte)
            stored += static_cast<UInt64>(static_cast<UInt8>(built.bytes[field.position + byte]))
                      << 8 * (field.size - 1 - byte);
    }
    const std::string size = std::to_string(built.bytes.size());
    EXPECT_EQ(
        (Heard{0,
               "{\"archive\":\"a.zarvo\",\"layout\":\"ZarvoFS\",\"version\":7,\"engineVersion\":\"5.\xEF\xBF\xBDx\","
               "\"engineRevision\":\"7041.3.0b12\",\"recordedSize\":" +
                   size + ",\"fileSize\":" + size + ",\"dataSize\":40001,\"storedSize\":" + std::to_string(stored) +
                   ",\"blocks\":{\"count\":3,\"largest\":30000,\"streamed\":0,\"none\":1,\"lzma\":1,\"lz4\":1,"
                   "\"lz4hc\":0,\"unknown\":0},\"entries\":3,\"files\":2,\"folders\":1,\"fileBytes\":40001}\n",
               ""}),
        Zarvo({"info", "--json", "a.zarvo"}));
}

TEST_F(ZarvoInfo, NamesTheLayout) {
    const std::pair<const char*, const char*> kCases[] = {
        {"fs", "ZarvoFS"}, {"web6", "ZarvoFS"}, {"web", "ZarvoWeb"}, {"raw", "ZarvoRaw"}, {"old", "ZarvoArchive"}};
    for (const auto& [form, name] : kCases) {
        MakeArchive("a.zarvo", Archive(std::string(form) + " a:x"));
        const std::string output = Zarvo({"info", "--json", "a.zarvo"}).output;
        EXPECT_NE(std::string::npos, output.find("\"layout\":\"" + std::string(name) + "\"")) << form << ": " << output;
    }
}

TEST_F(ZarvoInfo, PrintsTheSameForPeople) {
    MakeArchive("a.zarvo", Archive("a:xyz d|"));
    const std::string size = std::to_string(fs::file_size("a.zarvo"));
    EXPECT_EQ((Heard{0,
                     "archive:           a.zarvo\n"
                     "layout:            ZarvoFS\n"
                     "version:           7\n"
                     "engine version:    5.x.x\n"
                     "engine revision:   7041.3.0b12\n"
                     "recorded size:     " +
                         size + " bytes\nfile size:         " + size +
                         " bytes\n"
                         "data size:         3 bytes\n"
                         "stored size:       3 bytes\n"
                         "blocks:            1\n"
                         "largest block:     3 bytes\n"
                         "blocks streamed:   0\n"
                         "blocks stored:     1\n"
                         "blocks LZMA:       0\n"
                         "blocks LZ4:        0\n"
                         "blocks LZ4HC:      0\n"
                         "blocks unknown:    0\n"
                         "entries:           2\n"
                         "files:             1\n"
                         "folders:           1\n"
                         "bytes of files:    3 bytes\n",
                     ""}),
              Zarvo({"info", "a.zarvo"}));
}

TEST_F(ZarvoInfo, GoesOnAfterAnArchiveThatCannotBeOpened) {
    MakeArchive("a.zarvo", Archive("a:x"));
    const std::string line = Zarvo({"info", "--json", "a.zarvo"}).output;
    EXPECT_EQ((Heard{1, line + line, "zarvo: none: No such file or directory\n"}),
              Zarvo({"info", "--json", "a.zarvo", "none", "a.zarvo"}));
}

TEST_F(ZarvoInfo, EndsWith2WhenNoArchiveCanBeOpened) {
    EXPECT_EQ((Heard{2, "",
                     "zarvo: a: No such file or directory\nzarvo: -: an archive must be a file that can be read at any "
                     "place (a file of this name is ./-)\n"}),
              Zarvo({"info", "a", "-"}));
}

} // namespace
