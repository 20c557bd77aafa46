#include "Tools/Zarvo/Arguments.h"

#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <charconv>
#include <limits>

namespace {

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
            return MakeMessage(
                "%: '%' is no number from % to %",
                {name, value, std::to_string(least), std::to_string(std::numeric_limits<unsigned>::max())});
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

// Which of two subcommands an option before it belongs to is not known before the subcommand is: "-l" may take a value.
// So each one reads the arguments in its own way: the first operand has to be its name. One that has all of the options
// before its name comes first: "-o list extract" extracts into a folder named "list".
Arguments::Arguments(const std::vector<std::string>& arguments) : Arguments(kNoSubcommand, arguments) {
    for (const Subcommand* const subcommand : GetSubcommands()) {
        Arguments read(*subcommand, arguments);
        if (read.m_Operands.empty() || read.m_Operands[0] != subcommand->name) continue;
        if (!read.m_AreKnown && m_Subcommand != &kNoSubcommand) continue;
        *this = std::move(read);
        if (m_AreKnown) break;
    }
    if (m_Subcommand != &kNoSubcommand)
        m_Operands.erase(m_Operands.begin());
    else if (m_AreKnown && !m_Operands.empty())
        m_Complaint.clear(); // of options that another subcommand may have: that there is none of this name comes first
    if (!Has(kHelp) && !Has(kVersion)) {
        CheckValues();
        CheckOperands();
    }
}

Arguments::Arguments(const Subcommand& subcommand, const std::vector<std::string>& arguments)
    : m_Subcommand(&subcommand) {
    bool areOptions = true;
    for (size_t index = 0; index < arguments.size(); ++index) {
        const std::string& argument = arguments[index];
        if (!areOptions || argument.size() < 2 || argument[0] != '-')
            m_Operands.push_back(argument);
        else if (argument == "--")
            areOptions = false;
        else if (ReadOptions(argument, index + 1 < arguments.size() ? &arguments[index + 1] : nullptr))
            ++index;
    }
}

// Reads an option, or several letters, with a value that is joined to it. Returns whether the next argument, which is
// null after the last one, is the value.
bool Arguments::ReadOptions(std::string_view argument, const std::string* next) {
    const auto refuse = [&](std::string_view form) {
        Complain(MakeMessage("no such option: '%'", {form}));
        if (m_Operands.empty()) m_AreKnown = false;
    };
    const auto takeNext = [&](const Option* option, std::string_view form) {
        if (next == nullptr)
            Complain(MakeMessage("% needs a value", {form}));
        else
            m_Options.emplace_back(option, *next);
        return true;
    };

    if (argument.starts_with("--")) {
        const size_t mark = std::min(argument.find('='), argument.size());
        const Option* const option = FindOption(*m_Subcommand, argument.substr(2, mark - 2));
        const bool hasValue = mark != argument.size();
        if (option == nullptr)
            refuse(argument);
        else if (option->value.empty() && hasValue)
            Complain(MakeMessage("% takes no value", {argument.substr(0, mark)}));
        else if (!option->value.empty() && !hasValue)
            return takeNext(option, argument);
        else
            m_Options.emplace_back(option, hasValue ? argument.substr(mark + 1) : "");
        return false;
    }
    for (size_t place = 1; place < argument.size(); ++place) {
        const Option* const option = FindOption(*m_Subcommand, argument[place]);
        const bool takesValue = option != nullptr && !option->value.empty();
        const std::string form = '-' + std::string(FirstCharacter(argument.substr(place)));
        if (takesValue && place + 1 == argument.size()) return takeNext(option, form);
        if (option == nullptr)
            refuse(form);
        else
            m_Options.emplace_back(option, takesValue ? argument.substr(place + 1) : "");
        if (takesValue) break;
    }
    return false;
}

// In the order of the table, so that the same mistakes give the same message.
void Arguments::CheckValues() {
    for (const Option* const option : m_Subcommand->options)
        for (const std::string& value : FindAll(*option))
            Complain(CheckValue(*option, value));
}

void Arguments::CheckOperands() {
    const size_t needed = m_Subcommand == &kCat && Has(kFilesFrom) ? 1 : m_Subcommand->minOperands;
    if (m_Subcommand == &kNoSubcommand)
        Complain(m_Operands.empty() ? MakeMessage("no subcommand is named")
                                    : MakeMessage("no such subcommand: '%'", {m_Operands[0]}));
    else if (m_Operands.size() < needed)
        Complain(m_Operands.empty()      ? MakeMessage("no archive is named")
                 : m_Subcommand == &kCat ? MakeMessage("no pattern is given")
                                         : MakeMessage("no folder is named"));
    else if (m_Operands.size() > m_Subcommand->maxOperands)
        Complain(MakeMessage("'%' is one argument too many", {m_Operands[m_Subcommand->maxOperands]}));
}

void Arguments::Complain(std::string complaint) {
    if (m_Complaint.empty()) m_Complaint = std::move(complaint);
}

const std::string* Arguments::Find(const Option& option) const {
    const std::string* last = nullptr;
    for (const auto& [given, value] : m_Options)
        if (given == &option) last = &value;
    return last;
}

std::vector<std::string> Arguments::FindAll(const Option& option) const {
    std::vector<std::string> values;
    for (const auto& [given, value] : m_Options)
        if (given == &option) values.push_back(value);
    return values;
}
