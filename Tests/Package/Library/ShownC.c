/* The C program that docs/embedding.md shows. */
#include <zarvo.h>

#include <stdio.h>

#include <ShownFunctions.c.inc>

int main(void) {
#include <Shown.c.inc>
    return 0;
}
