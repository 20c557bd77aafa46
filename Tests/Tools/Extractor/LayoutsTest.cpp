// Archives that are whole, in every form that there is: everything comes out.
#include "Tests/Tools/Extractor/ExtractorTest.h"

static const std::string kFiles = " one.assets:1 folder/large:c200000 folder/empty: a/b/c:r65536 ";

TEST(Layouts, EveryKindOfBlockAtEverySizeAroundTheTransferSize) {
    for (const std::string layout : {"fs ", "web6 ", "old "})
        for (const std::string kind :
             {"stored", "lzma", "lz4", "lz4hc", "stored streamed", "lzma streamed", "lzma streamed endmark"})
            for (const char* size : {"4099", "65535", "65536 end", "65537", "131072 end", "131073", "0 end"})
                Expect({layout + kind + kFiles + "chunk=" + size});
}

TEST(Layouts, EverySectionInEveryVersionAndPlace) {
    for (const std::string form : {"version=0 ", "version=6 ", "version=7 ", "version=8 ", "web6 "})
        for (const std::string kind : {"stored section", "lzma section", "lz4 section", "lz4hc section"})
            for (const char* place : {"", "padded", "end", "end padded"})
                Expect({form + kind + " folder/a:c500 b:text empty| " + place});
}

TEST(Layouts, EveryLegacyVersionAndNumberOfLevels) {
    for (const std::string form : {"web", "web endmark", "raw"})
        for (const std::string version : {"0", "1", "2", "3", "4", "0x7FFFFFFF"})
            for (const char* levels : {" levels=1", " levels=2 levelBound=1", " levels=5 levelBound=0"})
                Expect({form + kFiles + "version=" + version + levels});
}

TEST(Layouts, OddArchivesThatAreWhole) {
    std::string many; // the section fits no buffer on the stack
    for (int index = 0; index < 300; ++index)
        many += " folder/" + std::to_string(index) + ":text";
    const std::vector<ArchiveBlock> mixed = {{1'000, kCompressionLz4}, {0}, {130'000, kCompressionLzma, true}, {0}};
    const ArchiveDescription longTexts{.engineVersion = Bytes("z5000"), .engineRevision = ""};
    const ArchiveDescription asIs{.blocks = {{1'000, {}, {}, Bytes("r1000")}}}, unflagged{.webSignatureFlag = false};
    const std::pair<std::string, ArchiveDescription> rows[] = {
        {"flags=0xFFFFFC40 block[0].flags=0xFF80 node[0].flags=0xFFFFFFFE a:text", longTexts},
        {"node[0].flags=0xFFFFFFFF folder|", {}},
        {"padded a/section:of-64-bytes", {}},
        {"old lz4 running[0].type=0xFFFFFFC2 running[0].streamed=0xFFFFFFFE a:c1000", {}},
        {"old running[0].uncompressed=0xFFFFFFFFFFFFFFFF running[1].uncompressed=3 a:text", {}},
        {"old empty: folder|", {}},
        {"old", {}},
        {"lzma section", {}},
        {"lz4 section chunk=70" + many, {}},
        {"stored" + kFiles, {.blocks = mixed}},
        {"lzma a:r1000", asIs},
        {"lz4 a:r1000", asIs},
        // The longer signature is not counted: what follows starts with the last byte of the header's flags.
        {"web6 hash.high=0x4000000000000000 a:text", unflagged},
        {"web6 end a:\xC0text", unflagged}};
    for (const auto& [words, form] : rows)
        Expect({words, "ok", "all", form});
    Expect({"a:text", "ok", "", {.directoryInSection = false}});
}

// Every read that looks for the directory asks for 65,536 bytes, and a stream that can't give as many is refused.
TEST(Layouts, WebDirectoryIsFoundInWholePiecesOnly) {
    for (const size_t size : {1'000u, 65'536u, 65'537u, 131'072u, 131'076u})
        for (const size_t rest : {1u, 64'535u, 64'536u, 64'537u, 65'534u, 65'535u, 65'536u}) {
            std::string words = "web"; // an entry takes its path and 9 bytes; the last one has the rest of the stream
            for (size_t left = size - 4; left >= 200; left -= 100)
                words += " " + std::string(91, 'p') + ":";
            words += " " + std::string(91 + (size - 4) % 100, 'q') + ":z" + std::to_string(rest);
            Expect({words, (size + rest) / 65'536 >= (size + 65'535) / 65'536 ? "ok" : "nodirectory"});
        }
}
