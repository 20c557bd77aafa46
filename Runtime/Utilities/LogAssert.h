// The log sink: console output, reported errors and failed checks. No function reports failure: without a standard
// output the texts are dropped. The program goes on after a report, unless the record has the fatal bit.
//
//   printf_console("  data size: %llu bytes\n", size);      // text as it is
//   ReportError(Format("Unable to open ...: %s", path).c_str());
//   if (!Check(type < kCompressionCount, "Assertion failed on expression: 't < kCompressionCount'")) return nullptr;
//
// Every function may be called from any thread. The hooks at the end are installed before other threads start.
// This header uses only plain C types, so that the containers, which the sink is built on, can report through it.
#pragma once

#include "Runtime/Core/SourceLocation.h"
#include "Runtime/Core/Types.h"

#include <cstdarg>

enum LogType : SInt32 {
    kLogTypeError = 0,
    kLogTypeAssert = 1,
    kLogTypeWarning = 2,
    kLogTypeLog = 3,
    kLogTypeException = 4,
    kLogTypeConsole = 5, // printf_console
};
constexpr int kLogTypeCount = 6;

// Bits of DebugStringToFileData::mode that have a meaning on their own. The sink also tests groups of bits.
enum LogMode : UInt32 {
    kLogModeError = 0x1,
    kLogModeAssert = 0x2,
    kLogModeFatal = 0x10,                  // the process is stopped after the record is printed
    kLogModeForceStackTrace = 0x300,       // the trace goes to the console even where the table says none
    kLogModeNoStackTrace = 0x40000,        // both traces are empty
    kLogModeKeepStackTrace = 0x400000,     // the caller's traces are kept
    kLogModeShowSourcePosition = 0x800000, // file and line follow the trace
};

// One report. Texts are the caller's, never null, and must outlive the call.
struct DebugStringToFileData {
    const char* message = "";
    const char* auxiliaryText = "";   // for the embedding application; the sink does not read it
    const char* shortStackTrace = ""; // added to assertion texts for the clean log handlers
    const char* stackTrace = "";      // printed after the message
    const char* file = "";
    SInt32 line = 0; // 0: none
    SInt32 column = -1;
    UInt32 mode = 0;
    SInt32 identifier = 0;

    // For the embedding application; the sink does not read these.
    SInt32 reserved0 = 0;
    UInt64 reserved1 = 0;
    bool reserved2 = true;
    UInt64 reserved3 = 0;
    SInt32 reserved4 = 0;
    const char* reservedText0 = "";
    const char* reservedText1 = "";
};

// Prints to standard output as printf does, then flushes.
[[gnu::format(printf, 1, 2)]] void printf_console(const char* format, ...);

void DebugStringToFile(const DebugStringToFileData& data);

// The sink's second stage: prints data with the stack traces that it has.
void DebugStringToFilePostprocessedStacktrace(const DebugStringToFileData& data);

// Reports a failed check with its complete text and returns 1. The program goes on, so the caller still has to handle
// the case.
int AssertImplementation(int identifier, const char* file, int line, int column, const char* message);

// Reports message as a failed check at the caller's position.
inline void ReportFailedCheck(const char* message, SourceLocation where = SourceLocation::current()) {
    AssertImplementation(0, where.file, where.line, -1, message);
}

// Returns condition. If it is false, reports message as a failed check at the caller's position.
inline bool Check(bool condition, const char* message, SourceLocation where = SourceLocation::current()) {
    if (!condition) [[unlikely]]
        ReportFailedCheck(message, where);
    return condition;
}

// Reports message as an error at the caller's position.
void ReportError(const char* message, SourceLocation where = SourceLocation::current());

// Calls the clean log handlers in list order, under g_LogHandlerListMutex.
[[gnu::format(printf, 2, 3)]] void CleanLogHandler(LogType type, const char* format, ...);

// Which stack trace accompanies a type of record.
enum StackTraceLogType : SInt32 {
    kStackTraceNone = 0,
    kStackTracePreprocessed = 1, // what gPreprocessor makes, or none
    kStackTraceNative = 2,       // a text that says that this platform can't make one
};
extern StackTraceLogType gStackTraceLogType[kLogTypeCount];

// Hooks for an embedding application; null until it installs one. Those that need the lock or strings are in
// LogHooks.h.

// Asked before every console print; false suppresses the print.
using CurrentLogEntryHandler = bool (*)(LogType type, const char* format, va_list arguments);
extern CurrentLogEntryHandler gCurrentLogEntryHandler;

using LogForwardFunction = void (*)(const DebugStringToFileData& data);
extern LogForwardFunction gLogToConsoleFunc; // called after the console output
extern LogForwardFunction gUtpLogFunc;       // called after that
