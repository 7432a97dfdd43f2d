// Makes allocations fail, and counts those that are live. Replaces malloc, calloc, realloc and free
// for the test program and its libraries. The address sanitizer has its own malloc: under it only
// operator new is replaced and nothing is counted, since the sanitizer finds leaks.
#ifndef ORVADRCORE_TESTS_ALLOCATION_FAULTS_H
#define ORVADRCORE_TESTS_ALLOCATION_FAULTS_H

// From now on `fails` decides for each allocation whether it fails; with null none does. It must
// not allocate.
void AskBeforeAllocating(bool (*fails)());

// How many allocations of this process are not freed yet.
long CountLiveAllocations();

#endif
