#include "Runtime/Utilities/LogAssert.h"

#include "Footing/Process.h"
#include "Runtime/Utilities/LogHooks.h"

#include <cstring>

// Constant-initialised, so that static objects may log before this file's objects are constructed.
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

// The type of a mode that has any of the bits.
struct ModeRow {
    UInt32 anyOf;
    LogType type;
};

// What a record is, for the stack-trace table and the handlers; a log without a match.
constexpr ModeRow kClassification[] = {
    {.anyOf = 0x20000, .type = kLogTypeException},
    {.anyOf = 0x951, .type = kLogTypeError},
    {.anyOf = 0x200002, .type = kLogTypeAssert},
    {.anyOf = 0x1280, .type = kLogTypeWarning},
};

// The type that a record is printed as, by other masks than it is classified by; an error without a match.
constexpr ModeRow kConsoleTypes[] = {
    {.anyOf = 0x404, .type = kLogTypeLog},
    {.anyOf = 0x280, .type = kLogTypeWarning},
    {.anyOf = 0x200002, .type = kLogTypeAssert},
};

// The first row that matches decides.
template <size_t kCount>
LogType FindType(const ModeRow (&rows)[kCount], UInt32 mode, LogType withoutMatch) {
    for (const ModeRow& row : rows)
        if ((mode & row.anyOf) != 0) return row.type;
    return withoutMatch;
}

LogType Classify(UInt32 mode) { return FindType(kClassification, mode, kLogTypeLog); }

StackTraceLogType StackTraceOf(LogType type) { return gStackTraceLogType[type]; }

FILE* ConsoleFile() {
    FILE* file = gConsoleFile.load(std::memory_order_acquire);
    if (file != nullptr || stdout == nullptr) return file;
    // Two threads that print first set the same stream, and neither overwrites one that was installed meanwhile.
    if (gConsoleFile.compare_exchange_strong(file, stdout, std::memory_order_acq_rel, std::memory_order_acquire))
        return stdout;
    return file;
}

void PrintToConsole(LogType type, const char* format, va_list arguments) {
    if (gCurrentLogEntryHandler != nullptr) {
        va_list handlerArguments; // reading a list uses it up, and vfprintf reads it again below
        va_copy(handlerArguments, arguments);
        const bool isWanted = gCurrentLogEntryHandler(type, format, handlerArguments);
        va_end(handlerArguments);
        if (!isWanted) return;
    }
    FILE* file = ConsoleFile();
    if (file == nullptr) return;
    (void)vfprintf(file, format, arguments); // a failed print can't be reported anywhere
    (void)fflush(file);
}

// The text ends with its own newline.
[[gnu::format(printf, 2, 3)]] void InternalConsoleWithNewline(LogType type, const char* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    PrintToConsole(type, format, arguments);
    va_end(arguments);
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

// Borrows text; it is copied only when a newline is added.
core::string ConsoleText(const char* text) {
    core::string result = core::string::wrap(text, kMemLabelGeneral);
    PlatformLogAssert::AvoidDoubleNewlineTranslation(result);
    return result;
}

// A text is as long as its reporter makes it. False, and the text is unchanged, when memory for the newline is refused.
bool EndWithNewline(core::string* text) {
    if (!text->empty() && text->back() == '\n') return true;
    if (text->grow(text->size() + 1) == nullptr) return false;
    text->push_back('\n');
    return true;
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

    const LogType console = FindType(kConsoleTypes, data.mode, kLogTypeError);
    core::string message = ConsoleText(data.message);
    if (!EndWithNewline(&message)) {
        // The next report must not land on this line.
        InternalConsoleWithNewline(console, "%s\n", message.c_str());
        message.clear();
    }
    if (HasStackTraceForConsole(type, data)) {
        core::string stackTrace = ConsoleText(data.stackTrace[0] == '\n' ? data.stackTrace + 1 : data.stackTrace);
        (void)EndWithNewline(&stackTrace); // without it a blank line is missing
        if (HasSourcePositionForConsole(data))
            InternalConsoleWithNewline(console, "%s%s\n(Filename: %s Line: %i)\n\n", message.c_str(),
                                       stackTrace.c_str(), data.file, data.line);
        else
            InternalConsoleWithNewline(console, "%s%s\n", message.c_str(), stackTrace.c_str());
    } else if (!message.empty()) {
        InternalConsoleWithNewline(console, "%s", message.c_str());
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
        va_list arguments; // one per handler: reading a list uses it up
        va_start(arguments, format);
        node->function(type, format, arguments);
        va_end(arguments);
    }
}
