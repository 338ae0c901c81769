/* A check for the suite's stand-alone C programs: reports a failed condition
 * and counts it, so main can return the count. */
#pragma once

#include <stdio.h>

static int failures = 0;

#define CHECK(cond)                                                            \
    do {                                                                       \
        if (!(cond)) {                                                         \
            fprintf(stderr, "%s:%d: failed: %s\n", __FILE__, __LINE__, #cond); \
            ++failures;                                                        \
        }                                                                      \
    } while (0)
