#include "steady_disk.h"

#include <unistd.h>

#include <ctime>

#include "real_function.h"

namespace {

bool isSteady = false;

// As long as a good disk takes.
int Flush(const char* real, int descriptor)
{
    if (!isSteady) return RealFunction<int(int)>(real)(descriptor);
    const timespec time{0, 200'000};
    ::nanosleep(&time, nullptr);
    return 0;
}

}  // namespace

SteadyDisk::SteadyDisk()
{
    isSteady = true;
}

SteadyDisk::~SteadyDisk()
{
    isSteady = false;
}

extern "C" int fsync(int descriptor)
{
    return Flush("fsync", descriptor);
}

extern "C" int fdatasync(int descriptor)
{
    return Flush("fdatasync", descriptor);
}
