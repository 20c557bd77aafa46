/* Python for the tests under a sanitizer, whose runtime has to be in the program. */
#include <Python.h>

int main(int argc, char** argv) { return Py_BytesMain(argc, argv); }
