// The search for matches of the SDK's LZMA encoder at levels below 5, where it takes most of the time: the hash chains
// of LzFind.c, which find the same matches in less time. A chain's head is fetched into the processor's cache some
// bytes before it is needed, and matches are compared by eight bytes.
#pragma once

#include <lzma/LzFind.h>

// Instead of MatchFinder_CreateVTable, with which LzmaEnc.c chooses the functions of a finder that has been set up. Any
// thread.
extern "C" void ChooseMatchFinder(CMatchFinder* finder, IMatchFinder* functions);
