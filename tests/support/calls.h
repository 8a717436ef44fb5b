/* What tests and programs under test share: see calls.c. */
#ifndef ORVEL_TESTS_SUPPORT_CALLS_H
#define ORVEL_TESTS_SUPPORT_CALLS_H

enum { kMostCalls = 4096 };

struct Calls {
    long count;       /* calls so far, of all processes */
    long target;      /* which one is struck; 0 none */
    int error;        /* what it fails with; 0: its process is killed */
    long work;        /* its number */
    int changesOnly;  /* whether only calls that change something are counted */
    char only[32];    /* the name of the calls that are counted, "" for all */
    char struck[200]; /* the struck call and its path */
    /* for each of the first calls a number that follows from it and all before it: names, paths, and from the first
     * change on the work */
    unsigned long long trace[kMostCalls];
};

#endif
