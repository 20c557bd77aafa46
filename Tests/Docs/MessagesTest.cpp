// The messages in the sources are those that the manual page explains. A message is a text that is given to puts,
// printf, printf_console or ReportError, because users see it. Failed checks are for developers; the manual page
// explains some of them.
#include "Tests/Support/TemporaryFolder.h"

#include <filesystem>
#include <gtest/gtest.h>
#include <regex>
#include <set>

namespace {

const std::string kRoot = VARNEX_SOURCE_DIR "/";

std::string Replace(const std::string& text, const char* pattern, const char* with) {
    return std::regex_replace(text, std::regex(pattern), with);
}

// The first group of every match.
std::vector<std::string> FindAll(const std::string& text, const char* pattern) {
    const std::regex regex(pattern);
    return {std::sregex_token_iterator(text.begin(), text.end(), regex, 1), std::sregex_token_iterator()};
}

// All sources of the command, without comments. Adjacent literals are joined, and lose their last newline.
std::string ReadSources() {
    std::string code;
    for (const char* const folder : {"Tools/Extractor", "Runtime", "Footing"})
        for (const auto& entry : std::filesystem::recursive_directory_iterator(kRoot + folder))
            if (entry.path().extension() == ".cpp" || entry.path().extension() == ".h")
                code += ReadFile(entry.path()) + "\n";
    code = Replace(Replace(code, "\n *//[^\n]*", "\n"), "\"\\s+\"", "");
    return Replace(Replace(code, " *\\\\n\"", "\""), "%(s|d|i|llu)", "%");
}

std::string ReadMessages() {
    const std::string manual = ReadFile(kRoot + "man/Varnex.1");
    const size_t from = manual.find("\n.SH MESSAGES\n");
    return from == std::string::npos ? "" : manual.substr(from, manual.find("\n.SH ", from + 1) - from);
}

TEST(Messages, AreThoseOfTheManualPage) {
    const std::string code = ReadSources();
    EXPECT_FALSE(std::regex_search(code, std::regex("\\b(fputs|fprintf|fwrite|putchar|perror|cout|cerr)\\b")));
    std::set<std::string> printed, explained, checks;
    for (const std::string& literal : FindAll(
             code,
             "\\b(?:puts|printf|printf_console|ReportError)\\((?!const char)\\s*(?:Format\\(\\s*)?(?:\"([^\"]*)\")?"))
        printed.insert(literal);
    EXPECT_EQ(0u, printed.count("")) << "a message whose text does not stand where it is printed";
    // The command never asks for the operations that print these.
    EXPECT_EQ(1u, printed.erase("Creating user config folder: %"));
    EXPECT_EQ(1u, printed.erase("statvfs failed with errno=%; path was %"));
    EXPECT_LT(15u, printed.size());

    for (const std::string& line : FindAll(ReadMessages(), "\n\\.BI ([^\n]*)")) {
        std::string text; // of literals and placeholders in turn
        for (const std::string& argument : FindAll(line, "(\"[^\"]*\"|\\S+)"))
            text += argument[0] == '"' ? argument.substr(1, argument.size() - 2) : "%";
        text = Replace(text, "\\\\\\(aq", "'");
        EXPECT_NE(std::string::npos, code.find('"' + text + '"')) << "not in the sources: " << text;
        EXPECT_TRUE((printed.count(text) != 0 ? explained : checks).insert(text).second) << "twice: " << text;
    }
    EXPECT_EQ(printed, explained);
    EXPECT_LT(3u, checks.size());
}

} // namespace
