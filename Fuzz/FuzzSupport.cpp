#include "Fuzz/FuzzSupport.h"

#include "Runtime/Utilities/LogAssert.h"

static bool PrintNothing(LogType, const char*, va_list) { return false; }

void SilenceConsole() { gCurrentLogEntryHandler = PrintNothing; }
