// Globs over whole paths. Any thread.
//
//   part       takes
//   *          any characters but "/", also none
//   ?          one character but "/"
//   [a-z]      one character of the set but "/"; "!" or "^" in front: one that is not in it; "]" in front is a member
//   **         anything, also none
//   **/        at the start of a component: nothing, or anything that ends with "/"
//   \          makes the next character stand for itself
//
// Characters are those of UTF-8; a byte that is not part of one is a character of its own. A "[" without its "]", and a
// "\" at the end, stand for themselves.
#pragma once

#include "Runtime/Core/Containers/StringRef.h"

// Whether the glob matches the whole text, or a folder above it: the part before any "/" or "\". Needs no memory, and
// time in proportion to the glob's length times the square of the text's, at most.
bool MatchGlobOrFolder(core::string_ref glob, core::string_ref text);

// Whether a text holds a character that has a meaning in globs.
bool IsGlob(core::string_ref text);
