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
    // Options may stand anywhere, also before the subcommand; the rest are operands, in their order. nullopt when the
    // arguments make no sense: *complaint then says why, and *subcommand whose help to look at.
    static std::optional<Arguments> Parse(const std::vector<std::string>& arguments, const Subcommand** subcommand,
                                          std::string* complaint);

    const Subcommand& GetSubcommand() const { return *m_Subcommand; }
    const std::vector<std::string>& GetOperands() const { return m_Operands; }

    bool Has(const Option& option) const { return Find(option) != nullptr; }

    // The value that was given last, or nullptr. Valid as long as this object.
    const std::string* Find(const Option& option) const;

    // All that were given, in their order.
    std::vector<std::string> FindAll(const Option& option) const;

private:
    explicit Arguments(const Subcommand& subcommand) : m_Subcommand(&subcommand) {}

    const Subcommand* m_Subcommand;
    std::vector<std::string> m_Operands;
    std::vector<std::pair<const Option*, std::string>> m_Options; // that were given; a flag's value is of no meaning
};

// "16M" is 16,777,216: a number and K, M, G or nothing. nullopt when it is none, 0 or over 64 bits.
std::optional<unsigned long long> ParseSize(std::string_view text);
