// Taking paths apart and joining them. The separator is "/" (a backslash is an ordinary character here), and nothing
// touches the disk. A function that returns a view returns a piece of its argument, the text "/", or an empty view, and
// allocates nothing. Any thread.
#pragma once

#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/Containers/StringRef.h"

// Joins base and tail into out, which must be empty. Exactly one separator stands at the seam (a tail that starts with
// two keeps one); an empty part adds nothing. "." and ".." stay as they are. out stays
// empty when memory is refused.
void AppendPathNameImpl(core::basic_string_ref<char> base, core::basic_string_ref<char> tail, char separator,
                        core::basic_string<char>& out);

// The same with "/" and a text constant; the result carries kMemLabelGeneral.
template <size_t N>
core::basic_string<char> AppendPathName(const core::basic_string<char>& base, const char (&tail)[N]) {
    core::basic_string<char> out(kMemLabelGeneral);
    AppendPathNameImpl(base, core::basic_string_ref<char>(tail, strnlen(tail, N)), '/', out);
    return out;
}

// The parent: "/a/b/" gives "/a", "/a" gives "/", "a" and "/" give an empty view.
core::basic_string_ref<char> DeleteLastPathNameComponent(core::basic_string_ref<char> path);

// What follows the last "/"; the whole path when there is none.
core::basic_string_ref<char> GetLastPathNameComponent(core::basic_string_ref<char> path);

// What follows the last "." of the last component (".profile" gives "profile"); empty when there is none.
core::basic_string_ref<char> GetPathNameExtension(core::basic_string_ref<char> path);

// The path behind a prefix and the separators that follow it. atStart: the prefix must stand at the start, or the path
// is returned unchanged; otherwise its first occurrence counts, and without one only leading separators are skipped.
core::basic_string_ref<char> SkipPathPrefix(core::basic_string_ref<char> path, core::basic_string_ref<char> prefix,
                                            bool atStart, ComparisonType comparison);

// Turns every backslash into "/", in place.
void ConvertSeparatorsToZarvo(char* path);
