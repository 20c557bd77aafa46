// The subcommands and their options, in one table that parsing, help and completions are made of. The manual page is
// held to it by a test. Constant; any thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

// What an option's value has to be: any text, a path, a number from 1 on, one from 0 on, bytes ("64M"), or one of
// Option::choices.
enum class ValueKind { kText, kFile, kCount, kNumber, kSize, kChoice };

struct Option {
    char letter = 0;             // 'j' for "-j"; 0: none
    std::string_view name = {};  // "threads" for "--threads"; empty: none
    std::string_view value = {}; // what help calls the value, "N"; empty: it takes none
    ValueKind kind = ValueKind::kText;
    std::string_view choices = {}; // with "|" between them
    std::string_view help = {};    // half a sentence
};

struct Subcommand {
    std::string_view name;
    std::string_view operands; // as the usage line shows them
    std::string_view summary;  // half a sentence
    std::string_view about;    // lines of help
    std::span<const Option* const> options;
    size_t minOperands;
    size_t maxOperands = SIZE_MAX;
};

extern const Option kLong, kNul, kNulInput, kNulOutput, kJson, kFilesFrom, kOutputFolder, kExclude, kOverwrite, kStrip,
    kKeepBroken, kDryRun, kVerbose, kAlgorithm, kMemory, kQuiet, kThreads, kProgress, kHelp, kVersion;
extern const Option kLayout, kCompression, kLevel, kBlockSize, kStreamed, kEngineVersion, kEngineRevision, kForce,
    kDryRunOfCreate;
extern const Option kForeground, kMountOptions;

extern const Subcommand kList, kInfo, kExtract, kCat, kTest, kSum, kCreate, kMount;

// What zarvo itself takes when no subcommand is named.
extern const Subcommand kNoSubcommand;

std::span<const Subcommand* const> GetSubcommands();

// "-j, --threads N". Without indent.
std::string DescribeOption(const Option& option);

// What --help prints.
std::string DescribeSubcommand(const Subcommand& subcommand);
