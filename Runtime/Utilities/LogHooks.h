// The log sink's parts for an embedding application that need more than plain C types; the rest is in LogAssert.h.
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

// Held while the clean log handlers are called; it is recursive, so that a handler may log. Constructed before any
// static object of a program and destroyed after them.
extern Mutex g_LogHandlerListMutex;

// A node of the circular list of clean log handlers. A handler does not change the list.
struct CleanLogEntryHandlerNode {
    CleanLogEntryHandlerNode* next;
    void (*function)(LogType type, const char* format, va_list arguments); // of the anchor: not called
};

// The list's anchor; null when there is no list.
extern CleanLogEntryHandlerNode* gCleanLogEntryHandlers VARNEX_GUARDED_BY(g_LogHandlerListMutex);

// Makes the two stack traces of a record whose type asks for kStackTracePreprocessed; all three texts come empty. A
// file text that is not empty afterwards takes the place of the record's; *line comes as the record's and may be
// changed. Any thread; installed before other threads start.
using StackTracePreprocessor = void (*)(const DebugStringToFileData& data, core::string* shortStackTrace,
                                        core::string* stackTrace, core::string* file, SInt32* line);
extern StackTracePreprocessor gPreprocessor;

// Where the console functions print. Null until the first print sets it to standard output; may be set at any time to
// a stream that outlives all prints.
extern std::atomic<FILE*> gConsoleFile;

namespace PlatformLogAssert {
// Takes back the doubling of newlines that some consoles cause; on this platform the text stays as it is.
void AvoidDoubleNewlineTranslation(core::string& text);
} // namespace PlatformLogAssert
