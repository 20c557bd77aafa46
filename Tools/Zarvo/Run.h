// What a subcommand has to work with. A subcommand is a function of it that returns the run's status; whether standard
// output failed, or a signal came, is seen to after it.
#pragma once

#include "Tools/Zarvo/Arguments.h"
#include "Tools/Zarvo/Output.h"
#include "Tools/Zarvo/Progress.h"
#include <zarvo.hpp>

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

struct Run {
    const Arguments& arguments;
    int input; // descriptor of standard input
    OutputBuffer& output;
    Console& console;
    std::string& done; // what was done, for the message of a run that a signal has ended; empty: results were printed

    const std::vector<std::string>& GetOperands() const { return arguments.GetOperands(); }

    // Opens an archive by its path as it was given. nullopt, and a message, when it can't be opened. What the library
    // reports meanwhile and later becomes messages.
    std::optional<zarvo::archive> OpenArchive(const std::string& path) const;

    // The same, with the size of the largest block that is decoded whole, and a function that is called with what the
    // library reports, on whatever thread it does.
    std::optional<zarvo::archive> OpenArchive(const std::string& path, uint64_t maxBlockBytes,
                                              std::function<void(std::string_view text)> log) const;

    // Whether an archive's path stands for a standard stream, which no archive can be; then there is a message.
    bool RefuseStream(const std::string& path) const;

    // The options of a run on a whole archive: those that all subcommands take, and progress, which is shown and stops
    // a run that nobody waits for. This object and progress must outlive them.
    zarvo::run_options MakeOptions(Progress& progress) const;

    // A path as list shows it, and its end: a newline, or NUL.
    void WritePath(const zarvo::entry& entry, std::string_view end = "\n") const {
        WritePath(entry.path(), entry.is_folder(), end);
    }
    void WritePath(std::string_view path, bool isFolder, std::string_view end = "\n") const;

    // A message on an entry of an archive, or on a pattern.
    void SayOfEntry(const std::string& archive, std::string_view entry, std::string_view text) const;

    // How many bytes the largest block may have that is decoded whole. Where no option says so, it depends on what is
    // free, and is another number each time.
    uint64_t GetMaxBlockBytes() const;
};

constexpr int kAllDone = 0;
constexpr int kSomethingWrong = 1;
constexpr int kNoArchive = 2;
constexpr int kWrongUsage = 2;

// Says what is wrong with the arguments, and where help is. Returns the run's status.
int RefuseUsage(Console& console, const Subcommand& subcommand, std::string_view complaint);

int RunList(const Run& run);
int RunInfo(const Run& run);
int RunExtract(const Run& run);
int RunCat(const Run& run);
int RunTest(const Run& run);
int RunSum(const Run& run);
int RunCreate(const Run& run);
int RunMount(const Run& run);
