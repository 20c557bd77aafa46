// Where a call stands in the source: a default argument of SourceLocation::current() names the caller's file and line.
// The standard library's own is not to be had with every compiler that builds this.
#pragma once

struct SourceLocation {
    static constexpr SourceLocation current(const char* fileName = __builtin_FILE(),
                                            int lineNumber = __builtin_LINE()) {
        return SourceLocation{fileName, lineNumber};
    }

    const char* file;
    int line;
};
