// The manual page and the completions, held to the table of options and to the sources.
#include "Tests/Tools/Zarvo/ZarvoTest.h"
#include "Tools/Zarvo/Options.h"

#include <algorithm>
#include <iterator>
#include <map>
#include <regex>
#include <set>

namespace {

const std::string kRoot = VARNEX_SOURCE_DIR "/";

// The first group of every match.
std::vector<std::string> FindAll(const std::string& text, const char* pattern) {
    const std::regex regex(pattern);
    return {std::sregex_token_iterator(text.begin(), text.end(), regex, 1), std::sregex_token_iterator()};
}

std::string ReadManualSection(const std::string& name) {
    const std::string manual = ReadFile(kRoot + "man/zarvo.1");
    const size_t from = manual.find("\n.SH " + name + "\n");
    return from == std::string::npos ? "" : manual.substr(from, manual.find("\n.SH ", from + 1) - from);
}

// The text of a line of arguments: a macro that changes fonts joins them, and mark, when there is one, stands for those
// that vary, which have no quotes.
std::string ReadManualLine(const std::string& line, const std::string& mark = "") {
    std::string text;
    for (std::string argument : FindAll(line, "(\"[^\"]*\"|\\S+)")) {
        const bool isQuoted = argument[0] == '"';
        if (isQuoted) argument = argument.substr(1, argument.size() - 2);
        text += isQuoted || mark.empty() ? argument : mark;
    }
    text = std::regex_replace(text, std::regex("\\\\-"), "-");
    text = std::regex_replace(text, std::regex("\\\\e"), "\\");
    text = std::regex_replace(text, std::regex("\\\\\\(dq"), "\"");
    return std::regex_replace(text, std::regex("\\\\\\(aq"), "'");
}

// In parentheses, the manual says which subcommands have an option; without them, it means all.
TEST(ZarvoManual, NamesTheSubcommandsOfEachOption) {
    std::map<std::string, std::string> owners, told;
    const auto collect = [&](const Subcommand& subcommand, const std::string& name) {
        for (const Option* const option : subcommand.options) {
            std::string& names = owners[DescribeOption(*option)];
            names += (names.empty() ? "" : ", ") + name;
        }
    };
    for (const Subcommand* const subcommand : GetSubcommands())
        collect(*subcommand, std::string(subcommand->name));
    const std::string all = owners[DescribeOption(kHelp)];
    collect(kNoSubcommand, "without a subcommand");
    const std::string options = ReadManualSection("OPTIONS");
    const std::regex row("\n\\.TP\n\\.BI? ([^\n]*)\n(?:\\.RB \\( ([^)]*) \\)|\\(([^)]*)\\)\n)?");
    for (std::sregex_iterator at(options.begin(), options.end(), row), end; at != end; ++at) {
        const std::string names = ReadManualLine((*at)[2]) + (*at)[3].str();
        told[ReadManualLine((*at)[1])] = names.empty() ? all : names;
    }
    for (auto& [option, names] : owners)
        names = std::regex_replace(names, std::regex("^" + all + ".*"), all);
    EXPECT_EQ(owners, told);
    EXPECT_LT(8u, owners.size());
}

TEST(ZarvoManual, HasEverySubcommand) {
    std::vector<std::string> known;
    for (const Subcommand* const subcommand : GetSubcommands())
        known.emplace_back(subcommand->name);
    EXPECT_EQ(known, FindAll(ReadManualSection("SYNOPSIS"), "\n\\.B zarvo (\\w+)"));
    EXPECT_EQ(known, FindAll(ReadManualSection("DESCRIPTION"), "\n\\.SS zarvo (\\w+)"));
}

// A message's fixed texts, with "%" for what varies: in the sources a literal, in the manual page words in turns.
TEST(ZarvoManual, HasTheMessagesOfTheSources) {
    std::string code;
    for (const char* const folder : {"Tools/Zarvo", "Library", "Library/Writer"})
        for (const auto& entry : fs::directory_iterator(kRoot + folder))
            if (entry.path().extension() == ".cpp" || entry.path().stem() == "Failure") code += ReadFile(entry.path());
    code = std::regex_replace(code, std::regex("\n *//[^\n]*"), "");
    code = std::regex_replace(code, std::regex("\"\\s+\""), "");
    std::set<std::string> said, explained;
    for (const std::string& form :
         FindAll(code, "\\b(?:MakeMessage|Set|SetSystem|SetDamaged)\\([^\"();]*\"((?:[^\"\\\\]|\\\\.)*)\""))
        said.insert(
            std::regex_replace(std::regex_replace(form, std::regex("%(s|u|llu)"), "%"), std::regex("\\\\(.)"), "$1"));
    for (const std::string& line : FindAll(ReadManualSection("MESSAGES"), "\n\\.BI ([^\n]*)")) {
        const std::string text = ReadManualLine(line, "%");
        EXPECT_TRUE(explained.insert(text).second) << text << " is there twice";
    }
    // Forms that others fill in, and what only programs that call the library hear.
    for (const char* const text :
         {"%", "%: %", "no such entry", "the path is not in its normal form", "the source ends too early",
          "another entry has the same path, or needs a folder in its place", "the offset is past the end",
          "a read delivered more than was asked", "stopped", "the files have % bytes; the limit (max_bytes) is %"})
        EXPECT_EQ(1u, said.erase(text)) << text;
    std::set<std::string> unexplained, unsaid;
    std::set_difference(said.begin(), said.end(), explained.begin(), explained.end(),
                        std::inserter(unexplained, unexplained.end()));
    std::set_difference(explained.begin(), explained.end(), said.begin(), said.end(),
                        std::inserter(unsaid, unsaid.end()));
    EXPECT_EQ(std::set<std::string>{}, unexplained);
    EXPECT_EQ(std::set<std::string>{}, unsaid);
}

class ZarvoCompletionsTest : public ZarvoTest {
protected:
    // What a line ends in after a press of the tabulator, in a bash without a terminal.
    static std::string Complete(const std::string& words) {
        return RunProgram("/bin/bash",
                          {"-c", "source <('" ZARVO_COMPLETIONS "' bash); compopt() { :; }; COMP_WORDS=(" + words +
                                     "); COMP_CWORD=$((${#COMP_WORDS[@]} - 1)); _zarvo; echo -n \"${COMPREPLY[*]}\""})
            .second;
    }
};

TEST_F(ZarvoCompletionsTest, OfBashFollowTheSubcommand) {
    const std::pair<const char*, const char*> kCases[] = {
        {"zarvo ''", "list info extract cat test sum create mount"},
        {"zarvo li", "list"},
        {"zarvo -q c", "cat create"},
        {"zarvo --v", "--version"},
        {"zarvo list --j", "--json"},
        {"zarvo cat --j", ""},
        {"zarvo cat info --f", "--files-from"},
        {"zarvo --progress ''", "auto always never"},
        {"zarvo list --progress = al", "always"},
        {"zarvo list --progress =", "auto always never"},
        {"zarvo list -j ''", ""},
        {"zarvo create -l --f", ""}, // as the value
        {"zarvo list -l --f", "--files-from"},
        {"zarvo extract --overwrite ''", "always never fail"},
        {"zarvo sum -a sha", "sha256 sha1 sha512"},
        {"zarvo list -- --j", ""},
    };
    for (const auto& [words, completions] : kCases)
        EXPECT_EQ(completions, Complete(words)) << words;
}

TEST_F(ZarvoCompletionsTest, OfEveryShellHaveEveryOption) {
    for (const std::string shell : {"bash", "zsh", "fish"}) {
        const auto [status, text] = RunProgram(ZARVO_COMPLETIONS, {shell});
        EXPECT_EQ(0, status);
        for (const Subcommand* const subcommand : GetSubcommands())
            for (const Option* const option : subcommand->options) {
                std::string form =
                    option->name.empty() ? std::string("-") + option->letter : "--" + std::string(option->name);
                if (shell == "fish")
                    form =
                        option->name.empty() ? std::string("-s ") + option->letter : "-l " + std::string(option->name);
                EXPECT_NE(std::string::npos, text.find(form)) << shell << " lacks " << form;
            }
    }
}

} // namespace
