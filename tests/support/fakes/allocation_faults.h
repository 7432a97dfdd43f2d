// Memory that runs out, as it cannot be had at will, and a count of what is in use. All of malloc,
// calloc, realloc and free of the test program and the libraries behind it goes through here. In
// builds with the address sanitizer, which has its own, it is operator new alone, and nothing is
// counted: the sanitizer finds what is not given back.
#ifndef ORVADRCORE_TESTS_ALLOCATION_FAULTS_H
#define ORVADRCORE_TESTS_ALLOCATION_FAULTS_H

// From now on asks before each allocation whether it is to fail; null never asks. What is asked
// must not allocate.
void AskBeforeAllocating(bool (*fails)());

// The allocations of this process that were not freed yet.
long CountLiveAllocations();

#endif
