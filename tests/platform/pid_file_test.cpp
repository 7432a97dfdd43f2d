// Pid files: CoreLibProcPidFileCreate() and CoreLibReadPidFile().
#include <orvacore/orvacore.h>

#include <sys/prctl.h>

#include <climits>
#include <filesystem>
#include <thread>

#include "caller.h"
#include "support/fixtures/temp_dir.h"
#include "support/fixtures/test_files.h"
#include "support/processes/child_checks.h"
#include "support/processes/reap.h"
#include "support/processes/rights.h"
#include "support/processes/stat_field.h"

namespace {

// In clock ticks since boot.
unsigned long long OwnStart()
{
    return std::stoull(StatField(::getpid(), 22));
}

std::string OwnText()
{
    return std::to_string(::getpid()) + "\n" + std::to_string(OwnStart()) + "\n";
}

class PidFileTest : public ::testing::Test {
  protected:
    // Of the calling process.
    int Create() const { return CoreLibProcPidFileCreate(path.c_str()); }
    pid_t Read() const { return CoreLibReadPidFile(path.c_str()); }

    void ExpectNotCreated(int error) const
    {
        errno = 0;
        EXPECT_EQ(Create(), -1);
        EXPECT_EQ(errno, error);
    }

    struct stat Status() const
    {
        struct stat status {};
        EXPECT_EQ(::lstat(path.c_str(), &status), 0);
        return status;
    }

    TempDir dir;
    std::string path = dir.File("x.pid");
};

TEST_F(PidFileTest, HoldsIdAndStart)
{
    EXPECT_EQ(Create(), 0);
    EXPECT_EQ(ReadFile(path), OwnText());
    EXPECT_EQ(Read(), ::getpid());
    EXPECT_EQ(NamesIn(dir.Path()), std::set<std::string>{"x.pid"});
}

TEST_F(PidFileTest, NamesTheCallingProcessWhateverItsName)
{
    for (const char* name : {"name", ") Z (", ") S 1 2 3", ")", "", "a b\n1 2", "((((("}) {
        SCOPED_TRACE(name);
        ChildProcess process([&](ChildProcess::Link& link) {
            ::prctl(PR_SET_NAME, name);
            if (Create() != 0 || ReadFile(path) != OwnText()) return;
            link.Tell();
            link.Await();
        });
        EXPECT_TRUE(process.Await());
        EXPECT_EQ(Read(), process.Pid());
        EXPECT_EQ(CoreLibProcAlive(Read()), 1);
        process.Tell();
        EXPECT_EQ(process.Join(), 0);
    }
}

TEST_F(PidFileTest, NamesADetachedChildThatCalls)
{
    CheckInChild([this] {
        Pipe done;
        const pid_t child = CoreLibProcForkEx(CORELIB_FORK_DETACHED);
        if (child == 0) {
            Create();
            done.Write(ReadFile(path) == OwnText() ? "right" : "wrong");
            ::_exit(0);
        }
        EXPECT_EQ(done.ReadToEnd(), "right");
        EXPECT_EQ(ReadFile(path).find(std::to_string(child) + "\n"), 0U);
    });
}

// A machine that has been up for long counts more ticks than 32 bits hold.
TEST_F(PidFileTest, ComparesAll64BitsOfTheStart)
{
    const unsigned long long start = OwnStart();
    const std::string id = std::to_string(::getpid()) + "\n";
    WriteFile(path, id + std::to_string(start) + "\n");
    EXPECT_EQ(Read(), ::getpid());
    WriteFile(path, id + std::to_string(start + (1ULL << 32U)) + "\n");
    EXPECT_EQ(Read(), 0);
}

TEST_F(PidFileTest, IsReadableByAllWhateverTheUmask)
{
    for (const mode_t mask : {0000U, 0022U, 0077U, 0777U}) {
        CheckInChild([&] {
            ::umask(mask);
            EXPECT_EQ(Create(), 0);
        });
        EXPECT_EQ(Status().st_mode, S_IFREG | 0644U);
    }
}

TEST_F(PidFileTest, IsReadByAnotherUser)
{
    EXPECT_EQ(Create(), 0);
    EXPECT_EQ(::chmod(dir.Path().c_str(), 0711), 0);
    const pid_t writer = ::getpid();
    CheckInChild([&] {
        EXPECT_TRUE(LoseRights());
        EXPECT_EQ(Read(), writer);
        EXPECT_EQ(CoreLibProcAlive(writer), 1);
    });
}

TEST_F(PidFileTest, IsReplacedAsAWhole)
{
    WriteFile(path, "1\n2\n");
    const std::string other = dir.File("other name");
    EXPECT_EQ(::link(path.c_str(), other.c_str()), 0);
    EXPECT_EQ(::chmod(path.c_str(), 0400), 0);
    EXPECT_EQ(Create(), 0);
    EXPECT_EQ(ReadFile(path), OwnText());
    EXPECT_EQ(Status().st_mode, S_IFREG | 0644U);
    EXPECT_EQ(ReadFile(other), "1\n2\n");  // the old file is not written to
    EXPECT_EQ(NamesIn(dir.Path()), (std::set<std::string>{"other name", "x.pid"}));
}

TEST_F(PidFileTest, ReplacesWhatADeadProcessLeft)
{
    CheckInChild([&] { EXPECT_EQ(Create(), 0); });
    EXPECT_EQ(CoreLibProcAlive(Read()), 0);
    EXPECT_EQ(Create(), 0);
    EXPECT_EQ(Read(), ::getpid());
}

TEST_F(PidFileTest, IsNotWrittenThroughASymbolicLink)
{
    const std::string precious = dir.File("precious");
    WriteFile(precious, "precious");
    std::filesystem::create_symlink(precious, path);
    EXPECT_EQ(Create(), 0);
    EXPECT_TRUE(S_ISREG(Status().st_mode));
    EXPECT_EQ(ReadFile(path), OwnText());
    EXPECT_EQ(ReadFile(precious), "precious");
}

TEST_F(PidFileTest, IsNotMadeThroughADanglingLink)
{
    std::filesystem::create_symlink(dir.File("target"), path);
    EXPECT_EQ(Create(), 0);
    EXPECT_EQ(ReadFile(path), OwnText());
    EXPECT_EQ(NamesIn(dir.Path()), std::set<std::string>{"x.pid"});
}

TEST_F(PidFileTest, IsNotMadeWhereNoFileCanBe)
{
    WriteFile(dir.File("file"), "");
    path = dir.File("missing/x.pid");
    ExpectNotCreated(ENOENT);
    path = dir.File("file/x.pid");
    ExpectNotCreated(ENOTDIR);
    path = dir.File(std::string(300, 'x'));
    ExpectNotCreated(ENAMETOOLONG);
    path = dir.File("dir");
    std::filesystem::create_directory(path);
    ExpectNotCreated(EISDIR);
    EXPECT_EQ(NamesIn(dir.Path()), (std::set<std::string>{"dir", "file"}));
}

TEST_F(PidFileTest, AnUnwritableDirectoryIsAnErrorAndTheOldFileStays)
{
    WriteFile(path, "1\n");
    EXPECT_EQ(::chmod(dir.Path().c_str(), 0555), 0);
    CheckInChild([&] {
        EXPECT_TRUE(LoseRights());
        ExpectNotCreated(EACCES);
    });
    EXPECT_EQ(::chmod(dir.Path().c_str(), 0700), 0);
    EXPECT_EQ(ReadFile(path), "1\n");
    EXPECT_EQ(NamesIn(dir.Path()), std::set<std::string>{"x.pid"});
}

TEST_F(PidFileTest, AFailureToWriteIsAnErrorAndTheOldFileStays)
{
    WriteFile(path, "1\n");
    CheckInChild([&] {
        SetSignal(SIGXFSZ, SIG_IGN);
        const rlimit none{0, RLIM_INFINITY};
        EXPECT_EQ(::setrlimit(RLIMIT_FSIZE, &none), 0);
        ExpectNotCreated(EFBIG);
    });
    EXPECT_EQ(ReadFile(path), "1\n");
    EXPECT_EQ(NamesIn(dir.Path()), std::set<std::string>{"x.pid"});
}

TEST_F(PidFileTest, OneOfManyWritersWins)
{
    std::array<std::thread, 4> threads;
    for (std::thread& thread : threads) {
        thread = std::thread([this] {
            for (int run = 0; run < 10; ++run) {
                EXPECT_EQ(Create(), 0);
                EXPECT_EQ(Read(), ::getpid());
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(ReadFile(path), OwnText());
    EXPECT_EQ(NamesIn(dir.Path()), std::set<std::string>{"x.pid"});
}

TEST_F(PidFileTest, AMissingFileHoldsNoId)
{
    EXPECT_EQ(Read(), 0);
    path = dir.File("missing/x.pid");
    EXPECT_EQ(Read(), 0);
    path = "";
    EXPECT_EQ(Read(), 0);
}

TEST_F(PidFileTest, ReadsOnlyALineThatIsAnId)
{
    const std::string own = std::to_string(::getpid());
    const std::string start = StatField(::getpid(), 22);
    struct Row {
        std::string text;
        pid_t pid;
    };
    const std::vector<Row> rows{
        {"", 0},
        {"\n", 0},
        {"garbage", 0},
        {"garbage\n" + own + "\n", 0},
        {"\n" + own + "\n", 0},
        {"0", 0},
        {"-5", 0},
        {"-" + own, 0},
        {"+" + own, 0},
        {"4294967297", 0},  // 1 in 32 bits
        {"2147483648", 0},
        {"-2147483649", 0},
        {"99999999999999999999", 0},
        {own + "abc", 0},
        {" " + own, 0},
        {own + " ", 0},
        {own + " " + start, 0},
        {own + "\r\n", 0},
        {own + std::string(1, '\0'), 0},
        {own + ".0", 0},
        {"0x1", 0},
        {std::string(1'000'000, '9'), 0},
        {std::string(1'000'000, '\n'), 0},
        {own, ::getpid()},
        {own + "\n", ::getpid()},
        {own + "\n\n", ::getpid()},
        {own + "\n" + start, ::getpid()},
        {own + "\n" + start + "\n", ::getpid()},
        {own + "\n" + start + "\nmore\n", ::getpid()},
        {own + "\n" + std::to_string(OwnStart() + 1) + "\n", 0},  // the id is used again
        {own + "\n" + std::to_string(OwnStart() - 1) + "\n", 0},
        {own + "\n1", 0},
        {own + "\n18446744073709551615\n", 0},
        {own + "\n" + std::string(15, '0') + "1\n", 0},
        {"2147483647", INT_MAX},  // of no process
        {"2147483647\n", INT_MAX},
        {"2147483647\n1\n", INT_MAX},
    };
    for (const Row& row : rows) {
        WriteFile(path, row.text);
        EXPECT_EQ(Read(), row.pid) << row.text.substr(0, 100);
    }
}

TEST_F(PidFileTest, ReadsTheIdOfAZombieUntilItIsUsedAgain)
{
    ChildProcess process([this](ChildProcess::Link&) { Create(); });
    const pid_t pid = process.Pid();
    AwaitZombie(pid);
    EXPECT_EQ(Read(), pid);
    EXPECT_EQ(CoreLibProcAlive(pid), 0);
    EXPECT_EQ(process.Join(), 0);
    EXPECT_EQ(Read(), pid);
    EXPECT_EQ(CoreLibProcAlive(pid), 0);
}

TEST_F(PidFileTest, AFileThatCannotBeReadHoldsNoId)
{
    WriteFile(path, std::to_string(::getpid()));
    EXPECT_EQ(::chmod(dir.Path().c_str(), 0711), 0);
    EXPECT_EQ(::chmod(path.c_str(), 0000), 0);
    CheckInChild([this] {
        EXPECT_TRUE(LoseRights());
        EXPECT_EQ(Read(), 0);
        path = dir.Path();
        EXPECT_EQ(Read(), 0);
    });
}

TEST_F(PidFileTest, APipeHoldsNoIdWithoutWaiting)
{
    EXPECT_EQ(::mkfifo(path.c_str(), 0600), 0);
    CheckInChild([this] { EXPECT_EQ(Read(), 0); });
    const int writer = ::open(path.c_str(), O_RDWR | O_CLOEXEC);
    const std::string text = std::to_string(::getpid()) + "\n";
    EXPECT_EQ(::write(writer, text.data(), text.size()), static_cast<ssize_t>(text.size()));
    CheckInChild([this] { EXPECT_EQ(Read(), 0); });
    ::close(writer);
}

TEST_F(PidFileTest, ReadsNoMoreThanAPidFileHolds)
{
    constexpr long SizeKiB = 512L * 1024;
    WriteFile(path, std::to_string(::getpid()) + "\n");
    EXPECT_EQ(::truncate(path.c_str(), SizeKiB * 1024), 0);
    CheckInChild([this] {
        const auto peakKiB = [] {
            rusage usage{};
            ::getrusage(RUSAGE_SELF, &usage);
            return usage.ru_maxrss;
        };
        const long before = peakKiB();
        EXPECT_EQ(Read(), ::getppid());
        EXPECT_LT(peakKiB() - before, SizeKiB / 4);
    });
}

TEST_F(PidFileTest, MakingAndReadingLeavesNoDescriptor)
{
    const std::set<int> before = Descriptors();
    EXPECT_EQ(Create(), 0);
    EXPECT_EQ(Read(), ::getpid());
    EXPECT_EQ(CoreLibProcAlive(::getpid()), 1);
    path = dir.File("missing/x.pid");
    ExpectNotCreated(ENOENT);
    EXPECT_EQ(Read(), 0);
    EXPECT_EQ(Descriptors(), before);
}

}  // namespace
