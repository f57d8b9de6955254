// SPDX-License-Identifier: Apache-2.0
// What a confined thread can and cannot do with files, by the system calls themselves. Confinement
// is for the rest of a thread's life, so each test confines a thread of its own.
#include "host/limits/confinement.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/eventfd.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "host/standard_streams.h"
#include "tests/host/limits/two_folders.h"
#include "tests/support/temporary_directory.h"

namespace {

namespace fs = std::filesystem;

using host::Confinement;
using host::Grants;
using platform::FileDescriptor;
using test::readFile;
using test::writeFile;
using testing::AnyOf;

constexpr int oldest = 1;

template <class Action>
void onConfinedThread(const Confinement& confinement, Action action) {
    std::thread([&] {
        confinement.confineThisThread();
        action();
    }).join();
}

// The error number of a system call that returned `result`; 0 when it succeeded.
int errorOf(long result) {
    return result < 0 ? errno : 0;
}

// What opening says: 0, or the error's number.
int tryOpen(const fs::path& path, int flags) {
    const FileDescriptor file(::open(path.c_str(), flags | O_CLOEXEC | O_NONBLOCK, 0644));
    return errorOf(file.get());
}

// What the file says, or the error's number as text.
std::string contentOf(const fs::path& path) {
    const FileDescriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
    if (file.get() < 0) {
        return "error " + std::to_string(errno);
    }
    std::string content(100, '\0');
    content.resize(host::readSome(file.get(), content.data(), content.size()));
    return content;
}

const std::string refused = "error " + std::to_string(EACCES);

// Each folder with a file and a folder in it.
class ConfinementTest : public test::TwoFolders {
protected:
    void SetUp() override {
        TwoFolders::SetUp();
        if (IsSkipped()) {
            return;
        }
        for (const fs::path& folder : {inside, outside}) {
            writeFile(folder / "file", folder.filename().string());
            writeFile(folder / "folder/file", folder.filename().string());
        }
    }

    // Each path leads to the file outside, but not on a confined thread.
    static void expectClosed(const Confinement& confinement, const std::vector<fs::path>& paths) {
        for (const fs::path& path : paths) {
            EXPECT_EQ(contentOf(path), "outside") << path;
        }
        onConfinedThread(confinement, [&] {
            for (const fs::path& path : paths) {
                EXPECT_EQ(contentOf(path), refused) << path;
                EXPECT_EQ(tryOpen(path, O_WRONLY | O_CREAT | O_TRUNC), EACCES) << path;
            }
        });
        for (const fs::path& path : paths) {
            EXPECT_EQ(contentOf(path), "outside") << path;
        }
    }

    static std::string fdPath(const FileDescriptor& file) {
        return "/proc/self/fd/" + std::to_string(file.get());
    }
};

// The same on kernels of several versions, as far as the running one can be like them.
class EachKernel : public ConfinementTest, public testing::WithParamInterface<int> {
protected:
    void SetUp() override {
        ConfinementTest::SetUp();
        if (!IsSkipped() && GetParam() > host::confinementVersion()) {
            GTEST_SKIP() << "the running kernel is older";
        }
    }

    Confinement confinement() const { return readWrite(GetParam()); }
};

INSTANTIATE_TEST_SUITE_P(Versions, EachKernel, testing::Values(oldest, 2, 3, 5),
                         testing::PrintToStringParamName());

TEST_P(EachKernel, LetsFilesInsideBeReadAndFoldersListed) {
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(contentOf(inside / "file"), "inside");
        EXPECT_EQ(contentOf(inside / "folder/file"), "inside");
        EXPECT_EQ(contentOf(inside / "folder/../file"), "inside");
        EXPECT_EQ(contentOf("/proc/self/root" + (inside / "file").string()), "inside");
        EXPECT_EQ(tryOpen(inside, O_RDONLY | O_DIRECTORY), 0);
        EXPECT_EQ(tryOpen(inside / "folder", O_RDONLY | O_DIRECTORY), 0);
    });
}

TEST_P(EachKernel, LetsFilesInsideBeWrittenCreatedRenamedAndRemoved) {
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(tryOpen(inside / "file", O_WRONLY), 0);
        EXPECT_EQ(tryOpen(inside / "file", O_WRONLY | O_TRUNC), 0);
        EXPECT_EQ(errorOf(::truncate((inside / "file").c_str(), 1)), 0);
        EXPECT_EQ(tryOpen(inside / "new", O_WRONLY | O_CREAT | O_EXCL), 0);
        EXPECT_EQ(tryOpen(inside / "folder/new", O_WRONLY | O_CREAT | O_EXCL), 0);
        EXPECT_EQ(errorOf(::rename((inside / "new").c_str(), (inside / "file").c_str())), 0);
        EXPECT_EQ(errorOf(::unlink((inside / "folder/new").c_str())), 0);
    });
    EXPECT_EQ(readFile(inside / "file"), "");
    EXPECT_FALSE(fs::exists(inside / "new"));
    EXPECT_FALSE(fs::exists(inside / "folder/new"));
}

TEST_P(EachKernel, LetsASaveSyncAndTakeOverPermissions) {
    onConfinedThread(confinement(), [&] {
        const FileDescriptor folder(::open(inside.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        const FileDescriptor file(
            ::openat(folder.get(), "new", O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
        EXPECT_EQ(errorOf(::fchown(file.get(), ::getuid(), ::getgid())), 0);
        EXPECT_EQ(errorOf(::fchmod(file.get(), 0640)), 0);
        EXPECT_EQ(errorOf(::fsync(file.get())), 0);
        EXPECT_EQ(errorOf(::renameat(folder.get(), "new", folder.get(), "file")), 0);
        EXPECT_EQ(errorOf(::fsync(folder.get())), 0);
    });
}

TEST_P(EachKernel, RefusesAbsoluteAndClimbingPaths) {
    expectClosed(confinement(),
                 {outside / "file", inside / "../outside/file",
                  inside / "folder/../../outside/folder/file", fs::relative(outside / "file")});
}

TEST_P(EachKernel, ListsNoFolderOutside) {
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(tryOpen(outside, O_RDONLY | O_DIRECTORY), EACCES);
        EXPECT_EQ(tryOpen(scratch.path(), O_RDONLY | O_DIRECTORY), EACCES);
        EXPECT_EQ(tryOpen("/", O_RDONLY | O_DIRECTORY), EACCES);
    });
}

TEST_P(EachKernel, RefusesToChangeAnythingOutside) {
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(tryOpen(outside / "file", O_WRONLY), EACCES);
        EXPECT_EQ(tryOpen(outside / "file", O_WRONLY | O_CREAT | O_TRUNC), EACCES);
        EXPECT_EQ(tryOpen(outside / "file", O_RDONLY | O_TRUNC), EACCES);
        EXPECT_EQ(tryOpen(outside / "new", O_WRONLY | O_CREAT), EACCES);
        EXPECT_EQ(tryOpen(outside, O_RDWR | O_TMPFILE), EACCES);
        EXPECT_EQ(errorOf(::unlink((outside / "file").c_str())), EACCES);
        EXPECT_EQ(errorOf(::rmdir((outside / "folder").c_str())), EACCES);
        EXPECT_EQ(errorOf(::mkdir((outside / "new").c_str(), 0755)), EACCES);
        EXPECT_EQ(errorOf(::rename((outside / "file").c_str(), (outside / "new").c_str())), EACCES);
    });
    EXPECT_EQ(readFile(outside / "file"), "outside");
    EXPECT_FALSE(fs::exists(outside / "new"));
}

TEST_P(EachKernel, RefusesSymbolicLinksThatLeadOut) {
    fs::create_symlink(outside / "file", inside / "to-file");
    fs::create_symlink("../outside", inside / "to-folder");
    fs::create_symlink("to-file", inside / "chain");
    expectClosed(confinement(), {inside / "to-file", inside / "to-folder/file", inside / "chain"});
}

TEST_P(EachKernel, CreatesNothingThroughSymbolicLinksThatLeadOut) {
    fs::create_symlink(outside, inside / "to-folder");
    fs::create_symlink(outside / "new", inside / "dangling");
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(tryOpen(inside / "to-folder", O_RDONLY | O_DIRECTORY), EACCES);
        EXPECT_EQ(tryOpen(inside / "to-folder/new", O_WRONLY | O_CREAT), EACCES);
        EXPECT_EQ(tryOpen(inside / "dangling", O_WRONLY | O_CREAT), EACCES);
    });
    EXPECT_FALSE(fs::exists(outside / "new"));
}

TEST_P(EachKernel, FollowsSymbolicLinksThatStayInside) {
    fs::create_symlink("folder/file", inside / "link");
    fs::create_symlink(inside / "new", inside / "dangling");
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(contentOf(inside / "link"), "inside");
        EXPECT_EQ(tryOpen(inside / "dangling", O_WRONLY | O_CREAT), 0);
    });
}

TEST_P(EachKernel, RefusesTheWaysThroughProc) {
    const FileDescriptor file(::open((outside / "file").c_str(), O_RDONLY | O_CLOEXEC));
    const FileDescriptor folder(::open(outside.c_str(), O_PATH | O_CLOEXEC));
    const std::string path = outside / "file";
    expectClosed(confinement(), {"/proc/self/root" + path, "/proc/thread-self/root" + path,
                                 "/proc/self/cwd/" + fs::relative(path).string(), fdPath(file),
                                 fdPath(folder) + "/file"});
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(contentOf("/proc/self/environ"), refused);
        EXPECT_EQ(tryOpen("/proc/self/mem", O_RDWR), EACCES);
        EXPECT_EQ(tryOpen("/proc/self/exe", O_RDONLY), EACCES);
    });
}

TEST_P(EachKernel, RefusesTheWayThroughAnotherProcess) {
    const pid_t other = ::fork();
    if (other == 0) {
        ::pause();
        ::_exit(0);
    }
    const std::string process = "/proc/" + std::to_string(other);
    expectClosed(confinement(), {process + "/root" + (outside / "file").string(),
                                 process + "/cwd/" + fs::relative(outside / "file").string()});
    ::kill(other, SIGKILL);
    ::waitpid(other, nullptr, 0);
}

TEST_P(EachKernel, RefusesPathsFromFoldersThatAreOpen) {
    const FileDescriptor folder(::open(outside.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(errorOf(::openat(folder.get(), "file", O_RDONLY)), EACCES);
        EXPECT_EQ(errorOf(::openat(folder.get(), "new", O_WRONLY | O_CREAT, 0644)), EACCES);
        EXPECT_EQ(errorOf(::unlinkat(folder.get(), "file", 0)), EACCES);
    });
}

TEST_P(EachKernel, MovesNothingAcrossTheBorder) {
    const auto rename = [](const fs::path& from, const fs::path& to) {
        return errorOf(::rename(from.c_str(), to.c_str()));
    };
    const auto link = [](const fs::path& from, const fs::path& to) {
        return errorOf(::link(from.c_str(), to.c_str()));
    };
    onConfinedThread(confinement(), [&] {
        EXPECT_THAT(rename(inside / "file", outside / "new"), AnyOf(EACCES, EXDEV));
        EXPECT_THAT(rename(outside / "file", inside / "new"), AnyOf(EACCES, EXDEV));
        EXPECT_THAT(link(inside / "file", outside / "new"), AnyOf(EACCES, EXDEV));
        EXPECT_THAT(link(outside / "file", inside / "new"), AnyOf(EACCES, EXDEV));
    });
    EXPECT_FALSE(fs::exists(inside / "new"));
    EXPECT_FALSE(fs::exists(outside / "new"));
}

TEST_P(EachKernel, MovesNothingFromOneFolderToAnother) {
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(errorOf(::rename((inside / "file").c_str(), (inside / "folder/new").c_str())),
                  EXDEV);
        EXPECT_EQ(errorOf(::link((inside / "file").c_str(), (inside / "folder/new").c_str())),
                  EXDEV);
    });
}

TEST_P(EachKernel, CreatesNothingButRegularFiles) {
    const std::string path = inside / "new";
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(errorOf(::mkdir(path.c_str(), 0755)), EACCES);
        EXPECT_EQ(errorOf(::symlink("/", path.c_str())), EACCES);
        EXPECT_EQ(errorOf(::mkfifo(path.c_str(), 0644)), EACCES);
        EXPECT_EQ(errorOf(::mknod(path.c_str(), S_IFSOCK | 0644, 0)), EACCES);
        EXPECT_THAT(errorOf(::mknod(path.c_str(), S_IFCHR | 0644, 0)), AnyOf(EACCES, EPERM));
        EXPECT_THAT(errorOf(::mknod(path.c_str(), S_IFBLK | 0644, 0)), AnyOf(EACCES, EPERM));
        EXPECT_EQ(errorOf(::rmdir((inside / "folder").c_str())), EACCES);
    });
    EXPECT_FALSE(fs::exists(path));
}

TEST_P(EachKernel, RefusesDevices) {
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(contentOf("/dev/zero"), refused);
        EXPECT_EQ(tryOpen("/dev/null", O_WRONLY), EACCES);
    });
}

TEST_P(EachKernel, RefusesMounts) {
    onConfinedThread(confinement(), [&] {
        EXPECT_EQ(errorOf(::mount(outside.c_str(), (inside / "folder").c_str(), nullptr, MS_BIND,
                                  nullptr)),
                  EPERM);
    });
}

// The other half of the thread's surroundings swaps a document for a link that leads out, and back.
TEST_P(EachKernel, NeverReadsOutsideWhileALinkIsSwapped) {
    fs::create_symlink(outside / "file", inside / "link");
    std::atomic<bool> done = false;
    std::thread swapper([&] {
        while (!done) {
            ::renameat2(AT_FDCWD, (inside / "file").c_str(), AT_FDCWD, (inside / "link").c_str(),
                        RENAME_EXCHANGE);
        }
    });
    int read = 0;
    int denied = 0;
    onConfinedThread(confinement(), [&] {
        while (read < 1000 || denied < 1000) {
            const std::string content = contentOf(inside / "file");
            read += content == "inside";
            denied += content == refused;
            if (content != "inside" && content != refused) {
                ADD_FAILURE() << content;
                break;
            }
        }
    });
    done = true;
    swapper.join();
}

TEST_P(EachKernel, NeverCreatesOutsideWhileAFolderIsSwapped) {
    fs::create_symlink(outside, inside / "link");
    std::atomic<bool> done = false;
    std::thread swapper([&] {
        while (!done) {
            ::renameat2(AT_FDCWD, (inside / "folder").c_str(), AT_FDCWD, (inside / "link").c_str(),
                        RENAME_EXCHANGE);
        }
    });
    int created = 0;
    int denied = 0;
    onConfinedThread(confinement(), [&] {
        while (created < 1000 || denied < 1000) {
            const int error = tryOpen(inside / "folder/new", O_WRONLY | O_CREAT);
            created += error == 0;
            denied += error == EACCES;
            if (error != 0 && error != EACCES) {
                ADD_FAILURE() << error;
                break;
            }
        }
    });
    done = true;
    swapper.join();
    EXPECT_FALSE(fs::exists(outside / "new"));
}

TEST_P(EachKernel, LetsNoOtherProgramRun) {
    fs::copy_file("/bin/true", inside / "program");
    onConfinedThread(confinement(), [&] {
        const pid_t child = ::fork();
        if (child == 0) {
            ::execl((inside / "program").c_str(), "program", nullptr);
            const int error = errno;
            ::execl("/bin/true", "true", nullptr);
            ::_exit(error == EACCES && errno == EACCES ? 42 : 1);
        }
        int status = 0;
        ::waitpid(child, &status, 0);
        EXPECT_EQ(WEXITSTATUS(status), 42);
    });
}

TEST_P(EachKernel, HoldsForThreadsAndProcessesStartedLater) {
    onConfinedThread(confinement(), [&] {
        std::thread([&] {
            EXPECT_EQ(contentOf(inside / "file"), "inside");
            EXPECT_EQ(contentOf(outside / "file"), refused);
        }).join();
        const pid_t child = ::fork();
        if (child == 0) {
            ::_exit(tryOpen(outside / "file", O_RDONLY));
        }
        int status = 0;
        ::waitpid(child, &status, 0);
        EXPECT_EQ(WEXITSTATUS(status), EACCES);
    });
}

TEST_F(ConfinementTest, LeavesOtherThreadsAsTheyAre) {
    onConfinedThread(readWrite(), [&] { EXPECT_EQ(contentOf(outside / "file"), refused); });
    EXPECT_EQ(contentOf(outside / "file"), "outside");
}

TEST_F(ConfinementTest, RefusesToTruncateOutsideWhereTheKernelCan) {
    if (host::confinementVersion() < 3) {
        GTEST_SKIP() << "the running kernel is older";
    }
    onConfinedThread(readWrite(), [&] {
        EXPECT_EQ(errorOf(::truncate((outside / "file").c_str(), 0)), EACCES);
    });
    EXPECT_EQ(readFile(outside / "file"), "outside");
}

TEST_F(ConfinementTest, TakesAHardLinkInsideForAFileInside) {
    fs::create_hard_link(outside / "file", inside / "hard-link");
    onConfinedThread(readWrite(), [&] {
        EXPECT_EQ(contentOf(inside / "hard-link"), "outside");
        EXPECT_EQ(contentOf(outside / "file"), refused);
    });
}

TEST_F(ConfinementTest, LetsPipesBeOpenedAgainButNoSocketsAndEvents) {
    int pipe[2];
    int sockets[2];
    ASSERT_EQ(::pipe2(pipe, O_CLOEXEC), 0);
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets), 0);
    const FileDescriptor pipeEnds[] = {FileDescriptor(pipe[0]), FileDescriptor(pipe[1])};
    const FileDescriptor socketEnds[] = {FileDescriptor(sockets[0]), FileDescriptor(sockets[1])};
    const FileDescriptor event(::eventfd(0, EFD_CLOEXEC));
    onConfinedThread(readWrite(), [&] {
        EXPECT_EQ(tryOpen(fdPath(pipeEnds[0]), O_WRONLY), 0);
        EXPECT_EQ(tryOpen(fdPath(socketEnds[0]), O_WRONLY), ENXIO);
        EXPECT_EQ(tryOpen(fdPath(event), O_WRONLY), ENXIO);
    });
}

TEST_F(ConfinementTest, FollowsAGrantedFolderThatIsRenamed) {
    const Confinement confinement = readWrite();
    fs::rename(inside, scratch / "moved");
    fs::rename(outside, inside);
    onConfinedThread(confinement, [&] {
        EXPECT_EQ(contentOf(scratch / "moved/file"), "inside");
        EXPECT_EQ(contentOf(inside / "file"), refused);
    });
}

TEST_F(ConfinementTest, ClosesAFolderThatIsMovedOut) {
    const Confinement confinement = readWrite();
    const FileDescriptor folder(::open((inside / "folder").c_str(), O_RDONLY | O_CLOEXEC));
    fs::rename(inside / "folder", scratch / "folder");
    onConfinedThread(confinement, [&] {
        EXPECT_EQ(contentOf(scratch / "folder/file"), refused);
        EXPECT_EQ(errorOf(::openat(folder.get(), "file", O_RDONLY)), EACCES);
    });
}

TEST_F(ConfinementTest, LetsReadOnlyFoldersAndFilesBeReadAndNoMore) {
    const Confinement confinement({.readWrite = {}, .readOnly = {inside, outside / "file"}});
    onConfinedThread(confinement, [&] {
        EXPECT_EQ(contentOf(inside / "folder/file"), "inside");
        EXPECT_EQ(tryOpen(inside, O_RDONLY | O_DIRECTORY), 0);
        EXPECT_EQ(tryOpen(inside / "file", O_WRONLY), EACCES);
        EXPECT_EQ(tryOpen(inside / "new", O_WRONLY | O_CREAT), EACCES);
        EXPECT_EQ(errorOf(::unlink((inside / "file").c_str())), EACCES);
        EXPECT_EQ(contentOf(outside / "file"), "outside");
        EXPECT_EQ(tryOpen(outside / "file", O_WRONLY), EACCES);
        EXPECT_EQ(contentOf(outside / "folder/file"), refused);
    });
}

TEST_F(ConfinementTest, TakesAFileThatReplacesAGrantedOneForAnother) {
    const Confinement confinement({.readWrite = {}, .readOnly = {inside / "file"}});
    fs::rename(outside / "file", inside / "file");
    onConfinedThread(confinement, [&] { EXPECT_EQ(contentOf(inside / "file"), refused); });
}

TEST_F(ConfinementTest, GrantsSeveralFolders) {
    const Confinement confinement({.readWrite = {inside, outside / "folder"}, .readOnly = {}});
    onConfinedThread(confinement, [&] {
        EXPECT_EQ(contentOf(inside / "file"), "inside");
        EXPECT_EQ(contentOf(outside / "folder/file"), "outside");
        EXPECT_EQ(contentOf(outside / "file"), refused);
    });
}

TEST_F(ConfinementTest, WithoutGrantsClosesEverything) {
    onConfinedThread(Confinement({}), [&] { EXPECT_EQ(contentOf(inside / "file"), refused); });
}

TEST_F(ConfinementTest, GrantsWhatASymbolicLinkPointsTo) {
    fs::create_symlink(inside, scratch / "link");
    const Confinement confinement({.readWrite = {scratch / "link"}, .readOnly = {}});
    onConfinedThread(confinement, [&] {
        EXPECT_EQ(contentOf(scratch / "link/file"), "inside");
        EXPECT_EQ(contentOf(inside / "file"), "inside");
    });
}

TEST_F(ConfinementTest, ConfinedTwiceAllowsWhatBothDo) {
    const Confinement both({.readWrite = {inside, outside}, .readOnly = {}});
    onConfinedThread(both, [&] {
        EXPECT_EQ(contentOf(outside / "file"), "outside");
        readWrite().confineThisThread();
        EXPECT_EQ(contentOf(inside / "file"), "inside");
        EXPECT_EQ(contentOf(outside / "file"), refused);
    });
    onConfinedThread(readWrite(), [&] {
        both.confineThisThread();
        EXPECT_EQ(contentOf(outside / "file"), refused);
    });
}

std::string failureOf(const Grants& grants) {
    try {
        const Confinement confinement(grants);
    } catch (const std::exception& error) {
        return error.what();
    }
    return "none";
}

TEST_F(ConfinementTest, NamesAGrantThatIsNotThere) {
    const std::string folder = scratch / "missing";
    EXPECT_EQ(failureOf({.readWrite = {inside, folder}, .readOnly = {}}),
              folder + " cannot be granted: No such file or directory");
    EXPECT_EQ(failureOf({.readWrite = {}, .readOnly = {folder}}),
              folder + " cannot be granted: No such file or directory");
}

TEST_F(ConfinementTest, NamesAFileThatShouldBeAFolder) {
    const std::string file = inside / "file";
    EXPECT_EQ(failureOf({.readWrite = {file}, .readOnly = {}}),
              file + " cannot be granted: Not a directory");
}

}  // namespace
