/// \file
/// Stand-in for the appliance's core library on Linux systems that lack it: the calls that the DR
/// library needs. Every call may be made from any thread, none throws, none logs.
#ifndef ORVACORE_ORVACORE_H
#define ORVACORE_ORVACORE_H

#include <cstdio>

/// Starts a program without a shell and gives a stream to read its standard output from.
/// \param path  the program's file; it is also its first argument
/// \param mode  "r", the only way there is
/// \param ...   further arguments (`const char*`), ended by a null pointer
/// \return the stream, to be closed with CoreLibPclose(); null with errno set when the program
///         cannot be started or the mode is another
/// \note The program inherits descriptors 0, 1 (the stream) and 2, and no others.
FILE* CoreLibPopen(const char* path, const char* mode, ...);

/// Closes a stream of CoreLibPopen() and waits for its program.
/// \return 0 when the program ended with code 0 (or its end cannot be known because the caller
///         ignores SIGCHLD), otherwise -1
int CoreLibPclose(FILE* stream);

/// Cuts characters off both ends of a text, in place.
/// \param text      the text; null is given back as it is
/// \param leading   the characters to cut at the beginning; null means white space
/// \param trailing  the characters to cut at the end; null means white space
/// \return `text`
char* CoreLibStrTrim(char* text, const char* leading, const char* trailing);

#endif
