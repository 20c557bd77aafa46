#include "Tests/Tools/Zarvo/ZarvoTest.h"
#include "Tools/Zarvo/Options.h"

namespace {

class ZarvoArguments : public ZarvoTest {};

TEST_F(ZarvoArguments, StandAnywhere) {
    for (const char* const name : {"list", "cat", "create", "-l", "--", "[a,b]", "-"})
        MakeArchive(name, Archive("a:x b,c:y [a,b]:z -l:v"));
    const std::string lines = "f 1 0 a\nf 1 1 b,c\nf 1 2 [a,b]\nf 1 3 -l\n", paths = "a\nb,c\n[a,b]\n-l\n";
    const struct {
        std::vector<std::string> arguments;
        std::string output;
    } kCases[] = {
        {{"list", "list"}, paths},
        {{"list", "cat", "-lq"}, lines},
        {{"list", "-ql", "-j4", "cat"}, lines},
        {{"-q", "list", "cat"}, paths},
        {{"-l", "-j", "2", "list", "list"}, lines},
        {{"--progress", "never", "list", "--threads=3", "list"}, paths},
        {{"list", "--", "-l"}, paths},
        {{"list", "--", "--"}, paths},
        {{"--", "list", "-l"}, paths},
        {{"list", "-l", "--", "-l"}, lines},
        {{"list", "[a,b]", "[a,b]"}, "a\n[a,b]\n"},
        {{"list", "list", "b,c", "--", "-l"}, "b,c\n-l\n"},
        {{"list", "./-"}, paths},
        {{"list", "-j", "1", "-j", "2", "-qq", "-lll", "list"}, lines},
        {{"-qo", "test", "extract", "--dry-run", "list"}, paths}, // "test" is -o's value
        {{"--strip=0", "-qx", "list", "extract", "--dry-run", "list"}, paths},
        {{"-l", "list", "create"}, lines}, // not "list" as the value of create's -l
    };
    for (const auto& [arguments, output] : kCases) {
        SCOPED_TRACE(arguments[0] + " " + arguments[1]);
        const Heard heard = Zarvo(arguments);
        EXPECT_EQ(output, heard.output) << heard.error;
        EXPECT_EQ(0, heard.status);
    }
}

TEST_F(ZarvoArguments, ThatMakeNoSenseAreRefusedInALine) {
    const struct {
        std::vector<std::string> arguments;
        const char* error;
    } kCases[] = {
        {{}, "zarvo: no subcommand is named; see 'zarvo --help'"},
        {{"-q"}, "zarvo: no subcommand is named; see 'zarvo --help'"},
        {{"a.zarvo"}, "zarvo: no such subcommand: 'a.zarvo'; see 'zarvo --help'"},
        {{"", "list"}, "zarvo: no such subcommand: ''; see 'zarvo --help'"},
        {{"lst", "-l", "a.zarvo"}, "zarvo: no such subcommand: 'lst'; see 'zarvo --help'"},
        {{"--fast"}, "zarvo: no such option: '--fast'; see 'zarvo --help'"},
        {{"list"}, "zarvo: no archive is named; see 'zarvo list --help'"},
        {{"list", "-q", "--"}, "zarvo: no archive is named; see 'zarvo list --help'"},
        {{"cat", "a"}, "zarvo: no pattern is given; see 'zarvo cat --help'"},
        {{"info", "-l", "a"}, "zarvo: no such option: '-l'; see 'zarvo info --help'"},
        {{"-z", "list", "a"}, "zarvo: no such option: '-z'; see 'zarvo list --help'"},
        {{"-zx", "list", "extract"}, "zarvo: no such option: '-z'; see 'zarvo list --help'"},
        {{"-x", "list", "extract", "-z"}, "zarvo: no such option: '-z'; see 'zarvo extract --help'"},
        {{"list", "-lz", "a"}, "zarvo: no such option: '-z'; see 'zarvo list --help'"},
        {{"list", "-q-", "a"}, "zarvo: no such option: '--'; see 'zarvo list --help'"},
        {{"list", "-!", "a"}, "zarvo: no such option: '-!'; see 'zarvo list --help'"},
        {{"list", "-qé", "a"}, "zarvo: no such option: '-é'; see 'zarvo list --help'"},
        {{"list", "-\xC3", "a"}, "zarvo: no such option: '-\\xc3'; see 'zarvo list --help'"},
        {{"list", "---", "a"}, "zarvo: no such option: '---'; see 'zarvo list --help'"},
        {{"list", "--js", "a"}, "zarvo: no such option: '--js'; see 'zarvo list --help'"},
        {{"list", "--\n", "a"}, "zarvo: no such option: '--\\n'; see 'zarvo list --help'"},
        {{"list", "--json=yes", "a"}, "zarvo: --json takes no value; see 'zarvo list --help'"},
        {{"list", "a", "-j"}, "zarvo: -j needs a value; see 'zarvo list --help'"},
        {{"list", "a", "-qj"}, "zarvo: -j needs a value; see 'zarvo list --help'"},
        {{"list", "a", "--memory"}, "zarvo: --memory needs a value; see 'zarvo list --help'"},
        {{"list", "-j0", "a"},
         "zarvo: -j, --threads N: '0' is no number from 1 to 4294967295; see 'zarvo list --help'"},
        {{"list", "--threads=", "a"},
         "zarvo: -j, --threads N: '' is no number from 1 to 4294967295; see 'zarvo list --help'"},
        {{"list", "-j", "2x", "a"},
         "zarvo: -j, --threads N: '2x' is no number from 1 to 4294967295; see 'zarvo list --help'"},
        {{"extract", "--strip=-1", "a"},
         "zarvo: --strip=N: '-1' is no number from 0 to 4294967295; see 'zarvo extract --help'"},
        {{"extract", "--strip", "4294967296", "a"},
         "zarvo: --strip=N: '4294967296' is no number from 0 to 4294967295; see 'zarvo extract --help'"},
        {{"extract", "-x"}, "zarvo: -x needs a value; see 'zarvo extract --help'"},
        {{"extract", "--overwrite=ask", "a"},
         "zarvo: --overwrite=WHEN: 'ask' is none of always|never|fail; see 'zarvo extract --help'"},
        {{"test", "-q"}, "zarvo: no archive is named; see 'zarvo test --help'"},
        {{"sum", "-a", "crc32", "a"},
         "zarvo: -a NAME: 'crc32' is none of sha256|sha1|md5|sha512|blake2b512; see 'zarvo sum --help'"},
        {{"list", "--memory", "1KB", "a"},
         "zarvo: --memory=SIZE: '1KB' is no size, such as 64M; see 'zarvo list --help'"},
        {{"list", "--memory=0", "a"}, "zarvo: --memory=SIZE: '0' is no size, such as 64M; see 'zarvo list --help'"},
        {{"list", "--memory=17179869184G", "a"},
         "zarvo: --memory=SIZE: '17179869184G' is no size, such as 64M; see 'zarvo list --help'"},
        {{"list", "--progress=", "a"},
         "zarvo: --progress=WHEN: '' is none of auto|always|never; see 'zarvo list --help'"},
        {{"list", "--progress=no", "a"},
         "zarvo: --progress=WHEN: 'no' is none of auto|always|never; see 'zarvo list --help'"},
    };
    for (const auto& [arguments, error] : kCases)
        EXPECT_EQ((Heard{2, "", std::string(error) + "\n"}), Zarvo(arguments));
}

TEST_F(ZarvoArguments, HelpAndVersionArePrintedWithoutAnArchive) {
    EXPECT_EQ((Heard{0, DescribeSubcommand(kNoSubcommand), ""}), Zarvo({"--help"}));
    EXPECT_EQ((Heard{0, DescribeSubcommand(kCat), ""}), Zarvo({"cat", "-qh"}));
    EXPECT_EQ((Heard{0, DescribeSubcommand(kList), ""}), Zarvo({"--help", "list", "none"}));
    EXPECT_EQ((Heard{0, "zarvo " VARNEX_VERSION "\n", ""}), Zarvo({"--version"}));
}

TEST_F(ZarvoArguments, MemoryLimitsTheBlocksOfEachSubcommand) {
    MakeArchive("a.zarvo", Archive("lz4 chunk=4096 a:c4096 b:x"));
    const std::string refusal = "zarvo: a.zarvo: a: block 0 of 4096 bytes is too large to be held in memory\n";
    const struct {
        std::vector<std::string> arguments;
        std::string output;
    } kCases[] = {
        {.arguments = {"cat", "--memory=2K", "a.zarvo", "a", "b"}, .output = "x"},
        {.arguments = {"extract", "-qv", "--memory=2K", "a.zarvo"}, .output = "b\n"},
    };
    for (const auto& [arguments, output] : kCases)
        EXPECT_EQ((Heard{1, output, refusal}), Zarvo(arguments)) << arguments[0];
}

} // namespace
