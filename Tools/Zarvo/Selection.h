// The patterns of a run: those that are operands, and after them those that --files-from names.
#pragma once

#include "Tools/Zarvo/Run.h"

#include <optional>
#include <string>
#include <vector>

struct PatternList {
    std::vector<std::string> patterns;
    bool isEverything = false; // no patterns were asked for
    bool isComplete = true;    // false: a file of --files-from could not be read, which has been said
};

PatternList ReadPatterns(const Run& run);

// Adds patterns for an archive. False, and a message, when memory is refused.
[[nodiscard]] bool AddPatterns(const Run& run, const std::string& archive, const std::vector<std::string>& list,
                               zarvo::patterns& patterns);

// Says which patterns of a list, all added in their order, have matched nothing, unless the output is closed. Whether
// all have matched.
[[nodiscard]] bool SayUnused(const Run& run, const std::string& archive, const PatternList& list,
                             const zarvo::patterns& patterns);

// Says that a pattern matches nothing in an archive.
void SayUnmatched(const Run& run, const std::string& archive, const std::string& pattern);
