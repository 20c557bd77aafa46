#include "Tools/Zarvo/Process.h"

int main(int argumentCount, char** arguments) { return RunProcess(argumentCount, arguments); }
