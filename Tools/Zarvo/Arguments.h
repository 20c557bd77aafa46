// The command line, taken apart as the table of options says.
#pragma once

#include "Tools/Zarvo/Options.h"

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

class Arguments {
public:
    // arguments: without the program's name. Options may stand anywhere, also before the subcommand; the rest are
    // operands, in their order.
    explicit Arguments(const std::vector<std::string>& arguments);

    // What makes no sense about them, or an empty text. If there is something, only the subcommand is of use: its help
    // says more.
    const std::string& GetComplaint() const { return m_Complaint; }

    const Subcommand& GetSubcommand() const { return *m_Subcommand; }
    const std::vector<std::string>& GetOperands() const { return m_Operands; }

    bool Has(const Option& option) const { return Find(option) != nullptr; }

    // The value that was given last, or nullptr. Valid as long as this object.
    const std::string* Find(const Option& option) const;

    // All that were given, in their order.
    std::vector<std::string> FindAll(const Option& option) const;

private:
    Arguments(const Subcommand& subcommand, const std::vector<std::string>& arguments);
    bool ReadOptions(std::string_view argument, const std::string* next);
    void CheckValues();
    void CheckOperands();
    void Complain(std::string complaint); // the first one is kept

    const Subcommand* m_Subcommand;
    std::vector<std::string> m_Operands;
    std::vector<std::pair<const Option*, std::string>> m_Options; // that were given; a flag's value is of no meaning
    std::string m_Complaint;
    bool m_AreKnown = true; // whether all options before the first operand are the subcommand's
};

// "16M" is 16,777,216: a number and K, M, G or nothing. nullopt when it is none, 0 or over 64 bits.
std::optional<unsigned long long> ParseSize(std::string_view text);
