// Globs over whole paths. Any thread.
//
//   part       takes
//   *          any characters but "/", also none
//   ?          one character but "/"
//   [a-z]      one character of the set but "/"; "!" or "^" in front: one that is not in it; "]" in front is a member
//   **         anything, also none
//   **/        at the start of a component: nothing, or anything that ends with "/"
//   \          nothing, and the next character stands for itself
//
// Characters are those of UTF-8; a byte that is part of none is a character of its own. A "[" without its "]", and a
// "\" at the end, stand for themselves.
#pragma once

#include "Runtime/Core/Containers/StringRef.h"

// Whether the glob takes the whole text, or a folder above it: what lies before a "/" or "\". Needs no memory, and
// never more time than the two lengths and the text's once more, multiplied.
bool MatchGlobOrFolder(core::string_ref glob, core::string_ref text);

// Whether a text holds anything that a glob reads otherwise than as itself.
bool IsGlob(core::string_ref text);
