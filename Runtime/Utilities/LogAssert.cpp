#include "Runtime/Utilities/LogAssert.h"

#include "Footing/Process.h"
#include "Runtime/Utilities/LogHooks.h"

#include <cstring>

// Constant-initialised, so that static objects may log before this file's turn has come.
constinit StackTraceLogType gStackTraceLogType[kLogTypeCount] = {
    kStackTracePreprocessed, // error
    kStackTracePreprocessed, // assert
    kStackTracePreprocessed, // warning
    kStackTraceNone,         // log
    kStackTracePreprocessed, // exception
    kStackTracePreprocessed, // console
};
constinit CurrentLogEntryHandler gCurrentLogEntryHandler = nullptr;
constinit CleanLogEntryHandlerNode* gCleanLogEntryHandlers = nullptr;
constinit StackTracePreprocessor gPreprocessor = nullptr;
constinit LogForwardFunction gLogToConsoleFunc = nullptr;
constinit LogForwardFunction gUtpLogFunc = nullptr;
constinit std::atomic<FILE*> gConsoleFile{nullptr};

namespace {

// What a record is, for the stack-trace table and the handlers; the first row that matches, else a log.
struct ClassificationRow {
    UInt32 anyOf;
    LogType type;
};
constexpr ClassificationRow kClassification[] = {
    {0x20000, kLogTypeException},
    {0x951, kLogTypeError},
    {0x200002, kLogTypeAssert},
    {0x1280, kLogTypeWarning},
};

LogType Classify(UInt32 mode) {
    for (const ClassificationRow& row : kClassification)
        if ((mode & row.anyOf) != 0) return row.type;
    return kLogTypeLog;
}

StackTraceLogType StackTraceOf(LogType type) { return gStackTraceLogType[type]; }

FILE* ConsoleFile() {
    FILE* file = gConsoleFile.load(std::memory_order_acquire);
    if (file != nullptr || stdout == nullptr) return file;
    // Two first printers: both set the same, and neither overwrites a stream that was installed meanwhile.
    if (gConsoleFile.compare_exchange_strong(file, stdout, std::memory_order_acq_rel, std::memory_order_acquire))
        return stdout;
    return file;
}

void PrintToConsole(LogType type, const char* format, va_list arguments) {
    if (gCurrentLogEntryHandler != nullptr) {
        va_list handlerArguments; // reading a list uses it up, and it is needed again below
        va_copy(handlerArguments, arguments);
        const bool isWanted = gCurrentLogEntryHandler(type, format, handlerArguments);
        va_end(handlerArguments);
        if (!isWanted) return;
    }
    FILE* file = ConsoleFile();
    if (file == nullptr) return;
    (void)vfprintf(file, format, arguments); // a console that takes nothing: there is nobody left to tell
    (void)fflush(file);
}

[[gnu::format(printf, 1, 2)]] void InternalLogConsoleWithNewline(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    PrintToConsole(kLogTypeLog, format, arguments);
    va_end(arguments);
}

[[gnu::format(printf, 1, 2)]] void InternalWarningConsoleWithNewline(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    PrintToConsole(kLogTypeWarning, format, arguments);
    va_end(arguments);
}

[[gnu::format(printf, 1, 2)]] void InternalAssertConsoleWithNewline(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    PrintToConsole(kLogTypeAssert, format, arguments);
    va_end(arguments);
}

[[gnu::format(printf, 1, 2)]] void InternalErrorConsoleWithNewline(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    PrintToConsole(kLogTypeError, format, arguments);
    va_end(arguments);
}

using ConsoleFunction = void (*)(const char* format, ...);

// How a record is printed; not the masks that classify it.
ConsoleFunction ChooseConsoleFunction(UInt32 mode) {
    if ((mode & 0x404) != 0) return InternalLogConsoleWithNewline;
    if ((mode & 0x280) != 0) return InternalWarningConsoleWithNewline;
    if ((mode & 0x200002) != 0) return InternalAssertConsoleWithNewline;
    return InternalErrorConsoleWithNewline;
}

void TellCleanLogHandlers(LogType type, const DebugStringToFileData& data) {
    if (type != kLogTypeAssert) {
        CleanLogHandler(type, "%s\n\n", data.message);
        return;
    }
    core::string text = core::string::wrap(data.message, kMemLabelGeneral);
    if (data.shortStackTrace[0] != '\0') {
        text += '\n';
        text += core::string_ref(data.shortStackTrace);
    }
    CleanLogHandler(type, "Assertion failed: %s\n\n", text.c_str());
}

// Borrows text; it is copied only when something must be added.
core::string ConsoleText(const char* text) {
    core::string result = core::string::wrap(text, kMemLabelGeneral);
    PlatformLogAssert::AvoidDoubleNewlineTranslation(result);
    return result;
}

// False, and the text is as it was, when memory for the newline is refused.
bool EndWithNewline(core::string* text) {
    if (text->empty() || text->back() != '\n') text->push_back('\n');
    return text->back() == '\n';
}

bool HasStackTraceForConsole(LogType type, const DebugStringToFileData& data) {
    if (data.stackTrace[0] == '\0') return false;
    const bool isForced = (data.mode & kLogModeForceStackTrace) != 0;
    if ((data.mode & kLogModeNoStackTrace) != 0) return isForced;
    return isForced || StackTraceOf(type) != kStackTraceNone;
}

bool HasSourcePositionForConsole(const DebugStringToFileData& data) {
    return (data.mode & kLogModeShowSourcePosition) != 0 && data.line != 0 && data.file[0] != '\0' &&
           strstr(data.file, "Debug.bindings") == nullptr;
}

} // namespace

void PlatformLogAssert::AvoidDoubleNewlineTranslation(core::string&) {}

void printf_console(const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    PrintToConsole(kLogTypeConsole, format, arguments);
    va_end(arguments);
}

int AssertImplementation(int identifier, const char* file, int line, int column, const char* message) {
    DebugStringToFileData data;
    data.message = message;
    data.file = file;
    data.line = line;
    data.column = column;
    data.mode = kLogModeAssert;
    data.identifier = identifier;
    DebugStringToFile(data);
    return 1;
}

void ReportError(const char* message, SourceLocation where) {
    DebugStringToFileData data;
    data.message = message;
    data.file = where.file;
    data.line = where.line;
    data.mode = kLogModeError;
    DebugStringToFile(data);
}

void DebugStringToFile(const DebugStringToFileData& data) {
    const LogType type = Classify(data.mode);
    DebugStringToFileData copy = data;
    core::string file(kMemLabelGeneral);
    core::string shortStackTrace(kMemLabelGeneral);
    core::string stackTrace(kMemLabelGeneral);

    if ((data.mode & kLogModeNoStackTrace) == 0) {
        const StackTraceLogType wanted = StackTraceOf(type);
        if ((data.mode & kLogModeKeepStackTrace) != 0 && wanted != kStackTraceNone) {
            DebugStringToFilePostprocessedStacktrace(data);
            return;
        }
        if (wanted == kStackTraceNative) {
            shortStackTrace = "Stacktrace is not supported on this platform.";
            stackTrace = "Stacktrace is not supported on this platform.";
            if ((data.mode & kLogModeShowSourcePosition) != 0) {
                copy.file = "";
                copy.line = 0;
            }
        } else if (wanted == kStackTracePreprocessed && gPreprocessor != nullptr) {
            gPreprocessor(data, &shortStackTrace, &stackTrace, &file, &copy.line);
            if (!file.empty()) copy.file = file.c_str();
        }
    }
    copy.shortStackTrace = shortStackTrace.c_str();
    copy.stackTrace = stackTrace.c_str();
    DebugStringToFilePostprocessedStacktrace(copy);
}

void DebugStringToFilePostprocessedStacktrace(const DebugStringToFileData& data) {
    const LogType type = Classify(data.mode);
    TellCleanLogHandlers(type, data);

    const ConsoleFunction print = ChooseConsoleFunction(data.mode);
    core::string message = ConsoleText(data.message);
    if (!EndWithNewline(&message)) {
        // The next report must not land on this line.
        print("%s\n", message.c_str());
        message.clear();
    }
    if (HasStackTraceForConsole(type, data)) {
        core::string stackTrace = ConsoleText(data.stackTrace[0] == '\n' ? data.stackTrace + 1 : data.stackTrace);
        (void)EndWithNewline(&stackTrace); // without it a blank line is missing
        if (HasSourcePositionForConsole(data))
            print("%s%s\n(Filename: %s Line: %i)\n\n", message.c_str(), stackTrace.c_str(), data.file, data.line);
        else
            print("%s%s\n", message.c_str(), stackTrace.c_str());
    } else if (!message.empty()) {
        print("%s", message.c_str());
    }

    if (gLogToConsoleFunc != nullptr) gLogToConsoleFunc(data);
    if (gUtpLogFunc != nullptr) gUtpLogFunc(data);
    if ((data.mode & kLogModeFatal) != 0) C99Api::Footing_Process_Abort(ZarvoClassic::Footing_ErrorCode_Fatal);
}

void CleanLogHandler(LogType type, const char* format, ...) {
    Mutex::AutoLock lock(g_LogHandlerListMutex);
    const CleanLogEntryHandlerNode* anchor = gCleanLogEntryHandlers;
    if (anchor == nullptr) return;
    for (const CleanLogEntryHandlerNode* node = anchor->next; node != anchor; node = node->next) {
        va_list arguments; // anew for each: reading a list uses it up
        va_start(arguments, format);
        node->function(type, format, arguments);
        va_end(arguments);
    }
}
