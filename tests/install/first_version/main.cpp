// A program as it was built against the first version: with its headers, linked to its symbols.
// scripts/abi runs it with the library of today and compares what it prints with expected.txt.
//
//   caller DIRECTORY    an empty directory of its own
#include "show.h"

int main(int, char* argv[])
{
    const std::string dir = argv[1];
    CallValues();
    CallConditions();
    CallCommands();
    CallDatabase(dir);
    CallFiles(dir);
    CallCache(dir);
    CallWebApi();
}
