#include "Tools/Zarvo/Arguments.h"

#include "Tools/Zarvo/Text.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <limits>

namespace {

bool IsOption(std::string_view argument) { return argument.size() > 1 && argument[0] == '-'; }

const Option* FindOption(const Subcommand& subcommand, std::string_view name) {
    for (const Option* const option : subcommand.options)
        if (!name.empty() && option->name == name) return option;
    return nullptr;
}

const Option* FindOption(const Subcommand& subcommand, char letter) {
    for (const Option* const option : subcommand.options)
        if (option->letter == letter) return option;
    return nullptr;
}

// Whether the argument after this one, which is an option, is its value.
bool TakesNext(const Subcommand& subcommand, std::string_view argument) {
    if (argument.starts_with("--")) {
        const Option* const option = FindOption(subcommand, argument.substr(2));
        return option != nullptr && !option->value.empty();
    }
    for (size_t index = 1; index < argument.size(); ++index) {
        const Option* const option = FindOption(subcommand, argument[index]);
        if (option != nullptr && !option->value.empty()) return index + 1 == argument.size();
    }
    return false;
}

// The index of the first argument that is neither an option nor an option's value; their number if there is none.
size_t FindOperand(const Subcommand& subcommand, const std::vector<std::string>& arguments) {
    for (size_t index = 0; index < arguments.size(); ++index) {
        if (arguments[index] == "--") return index + 1;
        if (!IsOption(arguments[index])) return index;
        if (TakesNext(subcommand, arguments[index])) ++index;
    }
    return arguments.size();
}

// What of an argument that is an option is none of the subcommand's, "-z" of "-lz"; empty where all is. Letters after
// one that takes a value are its value.
std::string FindUnknown(const Subcommand& subcommand, const std::string& argument) {
    if (argument.starts_with("--")) {
        const std::string_view name = std::string_view(argument).substr(2);
        return FindOption(subcommand, name.substr(0, name.find('='))) != nullptr ? "" : argument;
    }
    for (const char letter : argument.substr(1)) {
        const Option* const option = FindOption(subcommand, letter);
        if (option == nullptr) return {'-', letter};
        if (!option->value.empty()) break;
    }
    return "";
}

// Whether all options before an operand are the subcommand's.
bool AreKnown(const Subcommand& subcommand, const std::vector<std::string>& arguments, size_t operand) {
    for (size_t index = 0; index < operand && arguments[index] != "--"; ++index) {
        if (!FindUnknown(subcommand, arguments[index]).empty()) return false;
        if (TakesNext(subcommand, arguments[index])) ++index;
    }
    return true;
}

// Which of two subcommands an option before it belongs to is not known before the subcommand is: "-l" may take a value.
// So each one is tried: the first operand has to be its name, which is then taken out. One that has all of the options
// before its name comes first: "-o list extract" extracts into a folder named "list".
const Subcommand& TakeSubcommand(std::vector<std::string>& arguments) {
    const Subcommand* taken = &kNoSubcommand;
    size_t place = 0;
    for (const Subcommand* const subcommand : GetSubcommands()) {
        const size_t index = FindOperand(*subcommand, arguments);
        if (index >= arguments.size() || arguments[index] != subcommand->name) continue;
        const bool areKnown = AreKnown(*subcommand, arguments, index);
        if (!areKnown && taken != &kNoSubcommand) continue;
        taken = subcommand;
        place = index;
        if (areKnown) break;
    }
    if (taken != &kNoSubcommand) arguments.erase(arguments.begin() + static_cast<std::ptrdiff_t>(place));
    return *taken;
}

// CLI11 takes "--name=" for an option whose value is the next argument, and gives flags values: so "--name=value"
// becomes two arguments before it sees them. Returns what is wrong, if anything is.
std::string SplitAssignments(const Subcommand& subcommand, std::vector<std::string>& arguments) {
    std::vector<std::string> split;
    for (size_t index = 0; index < arguments.size(); ++index) {
        const std::string& argument = arguments[index];
        if (argument == "--") {
            split.insert(split.end(), arguments.begin() + static_cast<std::ptrdiff_t>(index), arguments.end());
            break;
        }
        // Not left to CLI11, either: it takes the end of "-q-" for "--".
        const std::string unknown = IsOption(argument) ? FindUnknown(subcommand, argument) : "";
        if (!unknown.empty()) return MakeMessage("no such option: '%'", {unknown});
        const size_t mark = argument.starts_with("--") ? argument.find('=') : std::string::npos;
        const Option* const option = mark == std::string::npos
                                         ? nullptr
                                         : FindOption(subcommand, std::string_view(argument).substr(2, mark - 2));
        if (option != nullptr) {
            if (option->value.empty()) return MakeMessage("% takes no value", {argument.substr(0, mark)});
            split.insert(split.end(), {argument.substr(0, mark), argument.substr(mark + 1)});
            continue;
        }
        split.push_back(argument);
        if (IsOption(argument) && TakesNext(subcommand, argument)) {
            if (++index == arguments.size()) return MakeMessage("% needs a value", {argument});
            split.push_back(arguments[index]);
        }
    }
    arguments = std::move(split);
    return "";
}

// What is wrong with a value, if anything is.
std::string CheckValue(const Option& option, const std::string& value) {
    const std::string name = DescribeOption(option);
    if (option.kind == ValueKind::kSize && !ParseSize(value))
        return MakeMessage("%: '%' is no size, such as 64M", {name, value});
    if (option.kind == ValueKind::kCount || option.kind == ValueKind::kNumber) {
        const unsigned least = option.kind == ValueKind::kCount ? 1 : 0;
        unsigned count = 0;
        const auto [end, error] = std::from_chars(value.data(), value.data() + value.size(), count);
        if (error != std::errc() || end != value.data() + value.size() || count < least)
            return MakeMessage("%: '%' is no number from % on", {name, value, std::to_string(least)});
    }
    const std::string choices = '|' + std::string(option.choices) + '|';
    if (option.kind == ValueKind::kChoice &&
        (value.find('|') != std::string::npos || choices.find('|' + value + '|') == std::string::npos))
        return MakeMessage("%: '%' is none of %", {name, value, option.choices});
    return "";
}

} // namespace

std::optional<unsigned long long> ParseSize(std::string_view text) {
    constexpr std::string_view kUnits = "KMG";
    unsigned long long number = 0;
    const char* const end = text.data() + text.size();
    const auto [unit, error] = std::from_chars(text.data(), end, number);
    if (error != std::errc() || number == 0 || end - unit > 1) return std::nullopt;
    const size_t place = unit == end ? 0 : kUnits.find(*unit) + 1; // npos + 1 is 0, too
    if (unit != end && place == 0) return std::nullopt;
    if (number > std::numeric_limits<unsigned long long>::max() >> (10 * place)) return std::nullopt;
    return number << (10 * place);
}

std::optional<Arguments> Arguments::Parse(const std::vector<std::string>& arguments, const Subcommand** subcommand,
                                          std::string* complaint) {
    std::vector<std::string> rest = arguments;
    *subcommand = &TakeSubcommand(rest);
    Arguments parsed(**subcommand);
    *complaint = SplitAssignments(**subcommand, rest);
    if (!complaint->empty()) return std::nullopt;

    // Neither operands nor subcommands are CLI11's: it would split an operand "[a,b]", and take an archive named "list"
    // for a subcommand. What it leaves over are operands and the first "--".
    CLI::App app;
    app.set_help_flag();
    app.allow_extras();
    std::vector<std::pair<const Option*, const CLI::Option*>> known;
    for (const Option* const option : (*subcommand)->options) {
        std::string names;
        if (option->letter != 0) names = {'-', option->letter};
        if (!option->name.empty()) names += (names.empty() ? "--" : ",--") + std::string(option->name);
        CLI::Option* const made = option->value.empty() ? app.add_flag(names) : app.add_option(names);
        made->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
        known.emplace_back(option, made);
    }
    std::ranges::reverse(rest);
    try {
        app.parse(std::move(rest));
    } catch (const CLI::ParseError& error) {
        *complaint = error.what();
        return std::nullopt;
    }

    bool areOperands = false;
    for (const std::string& left : app.remaining()) {
        if (!areOperands && left == "--")
            areOperands = true;
        else
            parsed.m_Operands.push_back(left);
    }
    for (const auto& [option, made] : known)
        for (const std::string& value : made->results())
            parsed.m_Options.emplace_back(option, value);
    if (parsed.Has(kHelp) || parsed.Has(kVersion)) return parsed;

    for (const auto& [option, value] : parsed.m_Options)
        if (*complaint = CheckValue(*option, value); !complaint->empty()) return std::nullopt;
    const size_t needed =
        (*subcommand)->minOperands - (parsed.Has(kFilesFrom) && (*subcommand)->minOperands > 1 ? 1 : 0);
    const std::vector<std::string>& operands = parsed.m_Operands;
    if (*subcommand == &kNoSubcommand)
        *complaint = operands.empty() ? MakeMessage("no subcommand is named")
                                      : MakeMessage("no such subcommand: '%'", {operands[0]});
    else if (operands.size() < needed)
        *complaint = operands.empty()       ? MakeMessage("no archive is named")
                     : *subcommand == &kCat ? MakeMessage("no pattern is given")
                                            : MakeMessage("no folder is named");
    else if (operands.size() > (*subcommand)->maxOperands)
        *complaint = MakeMessage("'%' is one argument too many", {operands[(*subcommand)->maxOperands]});
    if (!complaint->empty()) return std::nullopt;
    return parsed;
}

const std::string* Arguments::Find(const Option& option) const {
    const auto last =
        std::find_if(m_Options.rbegin(), m_Options.rend(), [&](const auto& given) { return given.first == &option; });
    return last != m_Options.rend() ? &last->second : nullptr;
}

std::vector<std::string> Arguments::FindAll(const Option& option) const {
    std::vector<std::string> values;
    for (const auto& [given, value] : m_Options)
        if (given == &option) values.push_back(value);
    return values;
}
