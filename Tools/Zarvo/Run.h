// What a subcommand has to work with. A subcommand is a function of it that returns the run's status; whether standard
// output failed, or a signal came, is seen to after it.
#pragma once

#include "Tools/Zarvo/Arguments.h"
#include "Tools/Zarvo/Output.h"
#include <zarvo.hpp>

#include <optional>
#include <string>
#include <string_view>
#include <vector>

struct Run {
    const Arguments& arguments;
    int input; // descriptor of standard input
    OutputBuffer& output;
    Console& console;

    const std::vector<std::string>& GetOperands() const { return arguments.GetOperands(); }

    // Opens an archive by its path as it was given. nullopt, and a message, when it can't be opened. What the library
    // reports meanwhile and later becomes messages.
    std::optional<zarvo::archive> OpenArchive(const std::string& path) const;

    // A message on an entry of an archive, or on a pattern.
    void SayOfEntry(const std::string& archive, std::string_view entry, std::string_view text) const;
};

constexpr int kAllDone = 0;
constexpr int kSomethingWrong = 1;
constexpr int kNoArchive = 2;

int RunList(const Run& run);
int RunInfo(const Run& run);
int RunCat(const Run& run);
