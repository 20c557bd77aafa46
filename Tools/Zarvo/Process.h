// The process around the command: its standard descriptors, which of them are terminals, and its signals.
#pragma once

// Runs zarvo with main's arguments and returns the process's status, or ends the process by the signal that ended the
// run: SIGINT, SIGTERM, or SIGPIPE when whoever read standard output has gone, as it ends cat.
int RunProcess(int argumentCount, char** arguments);
