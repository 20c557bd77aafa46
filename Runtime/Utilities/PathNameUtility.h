// Taking paths apart and joining them. The separator is "/" (a backslash is an ordinary character here), and nothing
// touches the disk. A function that returns a view returns a piece of its argument, the text "/", or an empty view, and
// allocates nothing. Any thread.
#pragma once

#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/Containers/StringRef.h"

// Joins base and tail into out, which must be empty. Exactly one separator stands at the seam (a tail that starts with
// two keeps one); an empty part adds nothing. "." and ".." stay as they are. out stays
// empty when memory is refused.
void AppendPathNameImpl(core::string_ref base, core::string_ref tail, char separator, core::string& out);

// The same with "/" and a text constant; the result carries kMemLabelGeneral.
template <size_t N>
core::string AppendPathName(const core::string& base, const char (&tail)[N]) {
    core::string out(kMemLabelGeneral);
    AppendPathNameImpl(base, core::string_ref(tail, strnlen(tail, N)), '/', out);
    return out;
}

// The parent: "/a/b/" gives "/a", "/a" gives "/", "a" and "/" give an empty view.
core::string_ref DeleteLastPathNameComponent(core::string_ref path);

// What follows the last "/"; the whole path when there is none.
core::string_ref GetLastPathNameComponent(core::string_ref path);

// What follows the last "." of the last component (".profile" gives "profile"); empty when there is none.
core::string_ref GetPathNameExtension(core::string_ref path);

// The path behind a prefix and the separators that follow it. atStart: the prefix must stand at the start, or the path
// is returned unchanged; otherwise its first occurrence counts, and without one only leading separators are skipped.
core::string_ref SkipPathPrefix(core::string_ref path, core::string_ref prefix, bool atStart,
                                ComparisonType comparison);

// Turns every backslash into "/", in place.
void ConvertSeparatorsToZarvo(char* path);
