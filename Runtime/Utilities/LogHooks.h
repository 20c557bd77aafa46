// The hooks of the log sink that need more than plain C types; the others are in LogAssert.h.
//
//   Mutex::AutoLock lock(g_LogHandlerListMutex);
//   node.next = gCleanLogEntryHandlers->next;   // the anchor is the application's
//   gCleanLogEntryHandlers->next = &node;
#pragma once

#include "Runtime/Core/Containers/String.h"
#include "Runtime/Threads/Mutex.h"
#include "Runtime/Threads/ThreadAnnotations.h"
#include "Runtime/Utilities/LogAssert.h"

#include <atomic>
#include <cstdio>

// Held while the clean log handlers are called. It is recursive, so that a handler may log. It is constructed before
// the static objects of any program and destroyed after them.
extern Mutex g_LogHandlerListMutex;

// A node of the circular list of clean log handlers. A handler must not change the list.
struct CleanLogEntryHandlerNode {
    CleanLogEntryHandlerNode* next;
    void (*function)(LogType type, const char* format, va_list arguments); // the anchor's is not called
};

// The list's anchor; null when there is no list.
extern CleanLogEntryHandlerNode* gCleanLogEntryHandlers VARNEX_GUARDED_BY(g_LogHandlerListMutex);

// Writes the two stack traces of a record whose type has kStackTracePreprocessed. The three texts are empty at the
// call. A *file that is not empty afterwards replaces the record's file; *line is the record's line and may be changed.
// Called on any thread; installed before other threads start.
using StackTracePreprocessor = void (*)(const DebugStringToFileData& data, core::string* shortStackTrace,
                                        core::string* stackTrace, core::string* file, SInt32* line);
extern StackTracePreprocessor gPreprocessor;

// The stream that the console functions print to. Null until the first print sets it to standard output. May be set at
// any time to a stream that outlives all prints.
extern std::atomic<FILE*> gConsoleFile;

namespace PlatformLogAssert {
// Undoes the doubling of newlines on platforms whose consoles double them; here the text is left unchanged.
void AvoidDoubleNewlineTranslation(core::string& text);
} // namespace PlatformLogAssert
