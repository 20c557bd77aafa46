// The patterns of a run: those that are operands, and after them those that --files-from names.
#pragma once

#include "Tools/Zarvo/Run.h"

#include <optional>
#include <string>
#include <vector>

struct PatternList {
    std::vector<std::string> patterns;
    bool isEverything = false; // none were asked for
    bool isComplete = true;    // false: a file of --files-from could not be read, which has been said
};

PatternList ReadPatterns(const Run& run);

// Says that a pattern matches nothing in an archive.
void SayUnmatched(const Run& run, const std::string& archive, const std::string& pattern);
