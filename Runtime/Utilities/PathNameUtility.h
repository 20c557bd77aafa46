// Takes paths apart and joins them, without looking at the disk. The separator is "/"; a backslash is an ordinary
// character. A function that returns a view returns part of its argument, the text "/" or an empty view, and allocates
// nothing. Any thread.
#pragma once

#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/Containers/StringRef.h"

// Joins base and tail into out, which must be empty, with one separator between them: one is added if there is none,
// one dropped if both have it. If base or tail is empty, out is the other. "." and ".." are not resolved. When memory
// is refused, out stays empty.
void AppendPathNameImpl(core::string_ref base, core::string_ref tail, char separator, core::string& out);

// The same with "/" and a text constant. The result has the label kMemLabelGeneral.
template <size_t N>
core::string AppendPathName(const core::string& base, const char (&tail)[N]) {
    core::string out(kMemLabelGeneral);
    AppendPathNameImpl(base, core::string_ref(tail, strnlen(tail, N)), '/', out);
    return out;
}

// The parent: "/a/b/" gives "/a", "/a" gives "/", "a" and "/" give an empty view.
core::string_ref DeleteLastPathNameComponent(core::string_ref path);

// The part after the last "/"; the whole path when there is none.
core::string_ref GetLastPathNameComponent(core::string_ref path);

// The part after the last "." of the last component: ".profile" gives "profile". Empty when there is no ".".
core::string_ref GetPathNameExtension(core::string_ref path);

// The path after a prefix and the separators that follow it. With atStart, a path that does not start with the prefix
// is returned unchanged. Without it, the first occurrence anywhere counts; if there is none, only leading separators
// are skipped.
core::string_ref SkipPathPrefix(core::string_ref path, core::string_ref prefix, bool atStart,
                                ComparisonType comparison);

// Turns every backslash into "/", in place.
void ConvertSeparatorsToZarvo(char* path);
