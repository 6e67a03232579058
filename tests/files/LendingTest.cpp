// Names that are lent: what they are good for, and for how long.
#include "files/Lending.h"

#include <dlfcn.h>
#include <gtest/gtest.h>
#include <sys/random.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstring>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "files/MemorySource.h"
#include "files/OpenSource.h"
#include "tests/support/ChildProcess.h"
#include "tests/support/ScratchDirectory.h"
#include "tests/support/TextSource.h"

namespace {
// What the system's randomness answers in place of its own, while set.
std::function<ssize_t(void*, std::size_t)> randomness;
}  // namespace

// Stands before the C library's in the order of look-up.
extern "C" __attribute__((visibility("default"))) ssize_t getrandom(void* buffer, size_t size,
                                                                    unsigned flags) {
    if (randomness) return randomness(buffer, size);
    static const auto next =
        reinterpret_cast<ssize_t (*)(void*, size_t, unsigned)>(dlsym(RTLD_NEXT, "getrandom"));
    return next(buffer, size, flags);
}

namespace zelm::files {
namespace {

using zmctest::Holding;
using SourcePtr = std::shared_ptr<ByteSource>;

std::string TextOf(ByteSource& source) {
    std::string text(32, '#');
    text.resize(source.ReadAt(0, text.data(), text.size()));
    return text;
}

TEST(Lending, ANameOpensItsSource) {
    const SourcePtr source = Holding("abc");
    const LentName name = Lend(source);
    ASSERT_TRUE(name);
    EXPECT_EQ(FindLent(name.Text()), source);
    EXPECT_EQ(FindLent(name.Utf8()), source);
    EXPECT_EQ(OpenSource(name.Text(), OpenMode::Read), source);
}

TEST(Lending, NamesHaveOneFormAndNoneComesTwice) {
    const SourcePtr source = Holding("abc");
    std::set<std::string> seen;
    for (int i = 0; i < 1000; ++i) {
        const LentName name = Lend(source);
        const std::string text = name.Utf8();
        EXPECT_EQ(text.size(), 41U);
        EXPECT_EQ(text.substr(0, 9), "zmc-lent:");
        EXPECT_EQ(text.find_first_not_of("0123456789abcdef", 9), std::string::npos);
        EXPECT_TRUE(String(name.Text()) == text.c_str());
        EXPECT_TRUE(seen.insert(text).second);
    }
    // Of 128,000 random bits about half are set: 10 deviations are left to chance.
    std::size_t set = 0;
    for (const std::string& text : seen)
        for (const char digit : text.substr(9))
            set += static_cast<std::size_t>(__builtin_popcount(
                static_cast<unsigned>(digit <= '9' ? digit - '0' : digit - 'a' + 10)));
    EXPECT_NEAR(static_cast<double>(set), 64000, 1800);
}

TEST(Lending, TheFormIsKnownAnywhere) {
    const LentName name = Lend(Holding("abc"));
    EXPECT_TRUE(LooksLent(String(name.Text())));
    EXPECT_TRUE(LooksLent(name.Utf8()));
    EXPECT_TRUE(LooksLent(std::string(name.Utf8())));
    EXPECT_TRUE(LooksLent("zmc-lent:"));
    EXPECT_TRUE(LooksLent(String("zmc-lent:whatever")));
    for (const char* const other : {"", "zmc-lent", "ZMC-LENT:00", " zmc-lent:00", "./zmc-lent:00",
                                    "/tmp/zmc-lent:00", "zmc-lend:00"}) {
        EXPECT_FALSE(LooksLent(other)) << other;
        EXPECT_FALSE(LooksLent(String(other))) << other;
    }
    EXPECT_FALSE(LooksLent(static_cast<const char*>(nullptr)));
    EXPECT_FALSE(LooksLent(String()));
}

TEST(Lending, NamesThatAreNotLentFindNothing) {
    const LentName name = Lend(Holding("abc"));
    std::string text = name.Utf8();
    EXPECT_FALSE(FindLent((text + "0").c_str()));
    EXPECT_FALSE(FindLent((" " + text).c_str()));
    text.back() = text.back() == '0' ? '1' : '0';
    EXPECT_FALSE(FindLent(text.c_str()));
    for (char& digit : text) digit = static_cast<char>(std::toupper(digit));
    EXPECT_FALSE(FindLent(text.c_str()));
    EXPECT_FALSE(FindLent(String()));
    EXPECT_FALSE(FindLent(""));
    EXPECT_FALSE(FindLent("zmc-lent:"));
}

TEST(Lending, TheNameGoesWithItsObject) {
    std::weak_ptr<ByteSource> watched;
    std::string text;
    {
        SourcePtr source = Holding("abc");
        watched = source;
        const LentName name = Lend(std::move(source));
        text = name.Utf8();
        EXPECT_TRUE(FindLent(text.c_str())) << "the loan keeps it";
    }
    EXPECT_FALSE(FindLent(text.c_str()));
    EXPECT_FALSE(OpenSource(text.c_str(), OpenMode::Read));
    EXPECT_TRUE(watched.expired());
}

TEST(Lending, WhoHasItOpenKeepsItsSource) {
    LentName name = Lend(Holding("abc"));
    const SourcePtr open = OpenSource(name.Text(), OpenMode::Update);
    const std::string text = name.Utf8();
    name.Withdraw();
    EXPECT_FALSE(name);
    EXPECT_STREQ(name.Utf8(), "");
    EXPECT_EQ(*name.Text(), 0);
    EXPECT_EQ(TextOf(*open), "abc");
    EXPECT_EQ(open->WriteAt(3, "d", 1), 1U);
    EXPECT_FALSE(FindLent(text.c_str()));
    name.Withdraw();
    EXPECT_FALSE(name);
}

TEST(Lending, ANameMovesWithItsLoan) {
    const SourcePtr one = Holding("one"), two = Holding("two");
    LentName first = Lend(one);
    const std::string firstText = first.Utf8();
    LentName moved(std::move(first));
    EXPECT_FALSE(first);  // NOLINT(bugprone-use-after-move): it is told to be empty
    EXPECT_EQ(FindLent(moved.Utf8()), one);
    LentName second = Lend(two);
    const std::string secondText = second.Utf8();
    moved = std::move(second);
    EXPECT_FALSE(FindLent(firstText.c_str())) << "what it held before is withdrawn";
    EXPECT_EQ(moved.Utf8(), secondText);
    LentName& same = moved;
    moved = std::move(same);
    EXPECT_EQ(FindLent(moved.Utf8()), two);
    moved = LentName();
    EXPECT_FALSE(FindLent(secondText.c_str()));
}

TEST(Lending, OneSourceUnderTwoNames) {
    const SourcePtr source = Holding("abc");
    LentName one = Lend(source);
    const LentName two = Lend(source);
    EXPECT_STRNE(one.Utf8(), two.Utf8());
    one.Withdraw();
    EXPECT_EQ(FindLent(two.Text()), source);
}

TEST(Lending, NothingIsNotLent) {
    EXPECT_FALSE(Lend(nullptr));
    EXPECT_FALSE(LentName());
}

TEST(Lending, OpeningObeysTheMode) {
    const auto writable = Holding("abc");
    const LentName name = Lend(writable);
    int error = -1;
    EXPECT_EQ(OpenSource(name.Text(), OpenMode::Update, &error), writable);
    EXPECT_EQ(error, 0);
    EXPECT_EQ(TextOf(*writable), "abc");
    EXPECT_EQ(OpenSource(name.Text(), OpenMode::Create, &(error = -1)), writable);
    EXPECT_EQ(error, 0);
    EXPECT_EQ(writable->Size(), 0U);

    const auto readOnly =
        std::make_shared<MemorySource>(MemorySource::Bytes(3, 'x'), MemorySource::Access::ReadOnly);
    const LentName other = Lend(readOnly);
    for (const OpenMode mode : {OpenMode::Create, OpenMode::Update}) {
        EXPECT_FALSE(OpenSource(other.Text(), mode, &(error = 0)));
        EXPECT_EQ(error, EACCES);
    }
    EXPECT_EQ(OpenSource(other.Text(), OpenMode::Read), readOnly);
    EXPECT_EQ(TextOf(*readOnly), "xxx");
}

// Cannot be made empty.
class Stubborn : public ByteSource {
protected:
    Transfer DoReadAt(std::uint64_t, void*, std::size_t) override { return {}; }
    int DoTellSize(std::uint64_t& size) const override { return size = 0, 0; }
    bool DoIsWritable() const override { return true; }
};

TEST(Lending, WhatCannotBeEmptiedIsNotCreated) {
    const LentName name = Lend(std::make_shared<Stubborn>());
    int error = 0;
    EXPECT_FALSE(OpenSource(name.Text(), OpenMode::Create, &error));
    EXPECT_EQ(error, ENOTSUP);
    EXPECT_TRUE(OpenSource(name.Text(), OpenMode::Update));
}

// Its end uses the registry, which must not be locked then.
class Busy : public Stubborn {
public:
    explicit Busy(std::atomic<int>& counter) : ended(counter) {}
    ~Busy() override {
        const LentName name = Lend(std::make_shared<Stubborn>());
        if (FindLent(name.Text())) ++ended;
    }

private:
    std::atomic<int>& ended;
};

TEST(Lending, TheEndOfASourceMayLendAndWithdraw) {
    std::atomic<int> ended{0};
    { const LentName name = Lend(std::make_shared<Busy>(ended)); }
    EXPECT_EQ(ended, 1);
}

// --- without good randomness ---

class Randomness : public testing::Test {
protected:
    ~Randomness() override { randomness = nullptr; }
};

TEST_F(Randomness, WithoutItNothingIsLent) {
    for (const ssize_t answer : {ssize_t{-1}, ssize_t{0}}) {
        randomness = [answer](void*, std::size_t) {
            errno = ENOSYS;
            return answer;
        };
        const LentName name = Lend(Holding("abc"));
        EXPECT_FALSE(name);
        EXPECT_STREQ(name.Utf8(), "");
        EXPECT_EQ(*name.Text(), 0);
    }
}

TEST_F(Randomness, ItIsWaitedForUntilThereIsEnough) {
    int calls = 0;
    randomness = [&calls](void* buffer, std::size_t) -> ssize_t {
        if (++calls == 1) {
            errno = EINTR;
            return -1;
        }
        *static_cast<unsigned char*>(buffer) = static_cast<unsigned char>(calls);
        return 1;
    };
    const LentName name = Lend(Holding("abc"));
    EXPECT_STREQ(name.Utf8(), "zmc-lent:02030405060708090a0b0c0d0e0f1011");
}

TEST_F(Randomness, ANameThatIsTakenIsNotGivenToASecond) {
    randomness = [](void* buffer, std::size_t size) {
        std::memset(buffer, 0xA5, size);
        return static_cast<ssize_t>(size);
    };
    const SourcePtr first = Holding("first");
    const LentName name = Lend(first);
    ASSERT_TRUE(name);
    const LentName second = Lend(Holding("second"));
    EXPECT_FALSE(second);
    EXPECT_STREQ(second.Utf8(), "");
    EXPECT_EQ(FindLent(name.Text()), first) << "and the first keeps its own";
}

// --- other processes, other modules ---

// Runs `work` in a copy of this process.
int InCopy(const std::function<int()>& work) {
    const pid_t child = fork();
    if (child == 0) _exit(work());
    int status = 0;
    if (waitpid(child, &status, 0) != child || !WIFEXITED(status)) return -1;
    return WEXITSTATUS(status);
}

TEST(LendingProcesses, ACopyHasWhatWasLentBeforeItAndKeepsItsOwnBooks) {
    LentName name = Lend(Holding("abc"));
    const std::string text = name.Utf8();
    int lentThere[2];
    ASSERT_EQ(pipe(lentThere), 0);
    EXPECT_EQ(InCopy([&] {
                  const SourcePtr source = FindLent(text.c_str());
                  if (!source || TextOf(*source) != "abc") return 1;
                  name.Withdraw();
                  if (FindLent(text.c_str())) return 2;
                  const LentName own = Lend(source);
                  if (!own || !FindLent(own.Text())) return 3;
                  return write(lentThere[1], own.Utf8(), 41) == 41 ? 0 : 4;
              }),
              0);
    char there[42] = {};
    EXPECT_EQ(read(lentThere[0], there, 41), 41);
    close(lentThere[0]);
    close(lentThere[1]);
    EXPECT_TRUE(LooksLent(there));
    EXPECT_FALSE(FindLent(there)) << "what the copy lent is its own";
    EXPECT_TRUE(FindLent(text.c_str())) << "what it withdrew is still good here";
}

TEST(LendingProcesses, AProgramThatIsStartedKnowsNone) {
    const LentName name = Lend(Holding("abc"));
    const auto result = zmctest::RunChild({ZMC_LENT_NAME_PROBE, name.Utf8()});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.out, "looks lent, opens nothing\n") << result.err;
}

TEST(LendingProcesses, TheExampleOfTheDocumentRuns) {
    const zmctest::ScratchDirectory folder;
    zmctest::WriteText(folder / "image.pyr", "KOBT");
    const auto result = zmctest::RunChild({ZMC_LENDING_GUIDE_EXAMPLE, folder.String()});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.err, "") << "nothing failed, nothing changed";
}

TEST(LendingModules, AModuleThatIsLoadedHasTheSameRegistry) {
    using Borrow = std::size_t (*)(const char16_t* name, char* buffer, std::size_t size);
    using LendThere = const char* (*)(const char* text);
    void* const module = dlopen(ZMC_BORROWING_MODULE, RTLD_NOW | RTLD_LOCAL);
    ASSERT_TRUE(module) << dlerror();
    const auto borrow = reinterpret_cast<Borrow>(dlsym(module, "BorrowAndRead"));
    const auto lend = reinterpret_cast<LendThere>(dlsym(module, "LendText"));
    const auto withdraw = reinterpret_cast<void (*)()>(dlsym(module, "WithdrawText"));
    ASSERT_TRUE(borrow && lend && withdraw);
    const LentName name = Lend(Holding("from the host"));
    char buffer[32] = {};
    EXPECT_EQ(borrow(name.Text(), buffer, sizeof buffer), 13U);
    EXPECT_STREQ(buffer, "from the host");
    const std::string there = lend("from the module");
    SourcePtr source = FindLent(there.c_str());
    ASSERT_TRUE(source);
    EXPECT_EQ(TextOf(*source), "from the module");
    withdraw();
    EXPECT_FALSE(FindLent(there.c_str()));
    // The code that ends a source is the module's, and must not go before it.
    source.reset();
    dlclose(module);
}

}  // namespace
}  // namespace zelm::files
