// Memory, bytes, scopes, threads, switches, contexts, reports and identifiers.
#include "frame/services/byteorder.h"
#include "frame/services/context.h"
#include "frame/services/debug.h"
#include "frame/services/identifiers.h"
#include "frame/services/memory.h"
#include "frame/services/reports.h"
#include "frame/services/scoped.h"
#include "frame/services/threads.h"
#include "tests/support/dice.h"

#include <gtest/gtest.h>

#include <boost/make_shared.hpp>

#include <algorithm>
#include <array>
#include <climits>
#include <cstring>
#include <functional>
#include <limits>
#include <list>
#include <memory>
#include <random>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

namespace {

using namespace hearth::utility;

// Runs the function on that many threads at once, each with its number.
void OnThreads(int count, std::function<void(int)> const& function)
{
    std::vector<std::thread> threads;
    for (int i = 0; i < count; ++i) threads.emplace_back(function, i);
    for (std::thread& thread : threads) thread.join();
}

// ---- memory

struct Tracked : Q_MemTrackedObject {
    explicit Tracked(bool fail = false)
    {
        if (fail) throw std::string("the constructor failed");
    }
    double data[5]{};
};

TEST(Memory, IsCountedByTheTextOfItsLabel)
{
    char label[] = "tests: a label";  // the same text at another address than the literal below
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    void* const blocks[] = {Q_AllocatePtr(1, label, 100), Q_AllocatePtrClear(2, "tests: a label", 11),
                            Q_AllocatePtr(3, nullptr, 0), Q_MemTrackedObject::TrackedNew(48, label)};
    label[0] = 'X';  // the counts must not depend on the caller's buffer
    EXPECT_EQ((Q_MemoryCount{159, 3}), Q_MemoryLive("tests: a label"));
    EXPECT_EQ((Q_MemoryCount{}), Q_MemoryLive("tests: a label that nobody used"));
    EXPECT_EQ((Q_MemoryCount{before.bytes + 159, before.blocks + 4}), Q_MemoryLive(nullptr));
    std::vector<Q_MemoryCount> seen;
    auto const visit = [](void* context, char const* text, Q_MemoryCount const& count) {
        if (std::strcmp(text, "tests: a label") == 0)
            static_cast<std::vector<Q_MemoryCount>*>(context)->push_back(count);
    };
    Q_ForEachMemoryLabel(visit, &seen);
    EXPECT_EQ((std::vector<Q_MemoryCount>{{159, 3}}), seen);
    for (void* const block : blocks) {
        EXPECT_EQ(0u, reinterpret_cast<std::uintptr_t>(block) % 16);
        block == blocks[3] ? Q_MemTrackedObject::TrackedDelete(block) : Q_FreePtr(block);
    }
    Q_FreePtr(nullptr);
    Q_FreeHandle(nullptr);
    EXPECT_EQ(0u, Q_GetHandleSize(nullptr));
    Q_AccountAllocationEx(4096, 1);
    EXPECT_EQ((Q_MemoryCount{before.bytes + 4096, before.blocks + 1}), Q_MemoryLive(nullptr));
    EXPECT_EQ((Q_MemoryCount{4096, 1}), Q_MemoryLive(Q_AccountedElsewhere));
    Q_AccountAllocationEx(4096, 0);
    EXPECT_THROW(new Tracked(true), std::string);
    for (std::size_t const size : {0u, 1u, 16u, 23u, 1000u}) {
        char** const handle = Q_AllocateHandleClear(1, "tests: handle", size);
        ASSERT_NE(nullptr, handle);
        EXPECT_EQ(size, Q_GetHandleSize(handle));
        EXPECT_EQ(0u, reinterpret_cast<std::uintptr_t>(*handle) % 16);
        EXPECT_EQ(std::string(size, 0), std::string(*handle, size));
        std::memset(*handle, 0x5A, size);  // all of it is the caller's: the sanitizer looks on
        std::size_t granted = 0;
        void* const block = hearth::allocator::MemoryRecycler::Allocate(size, &granted);
        ASSERT_GE(granted, size);
        std::memset(block, 1, granted);
        hearth::allocator::MemoryRecycler::Recycle(block, size % 2 ? granted : size);
        Q_FreeHandle(handle);
    }
    std::size_t const greatest = std::numeric_limits<std::size_t>::max();
    EXPECT_EQ(nullptr, Q_AllocatePtr(1, "tests: huge", greatest));
    EXPECT_EQ(nullptr, Q_AllocateHandleClear(1, "tests: huge", greatest - 8));
    EXPECT_EQ(nullptr, hearth::allocator::MemoryRecycler::Allocate(greatest, nullptr));
    EXPECT_THROW(Q_Allocator<double>().allocate(greatest / 4), std::bad_alloc);
    EXPECT_THROW(hearth::allocator::RecyclingAllocator<double>().allocate(greatest / 4), std::bad_alloc);
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

// Every way to get memory: each tries once, cleans up, and says whether it got what it wanted.
bool Gets(int way)
try {
    void* const block = way == 0   ? Q_AllocatePtr(1, "tests", 8)
                        : way == 1 ? Q_AllocatePtrClear(1, "tests", 8)
                                   : nullptr;
    char** const handle = way == 2 ? Q_AllocateHandleClear(1, "tests", 8) : nullptr;
    Q_FreePtr(block);
    Q_FreeHandle(handle);
    return block || handle || (way == 3 && std::make_unique<Tracked>()) ||
           (way == 4 && std::vector<int, Q_Allocator<int>>(5).size() == 5) ||
           (way == 5 && u16str(100, 'x').size() == 100);
} catch (std::bad_alloc const&) {
    return false;
}

TEST(Memory, TheNthAllocationOfOneThreadFailsAndOnlyThatOne)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (int way = 0; way < 6; ++way)
        for (int n = 1; n <= 3; ++n) {
            Q_FailAllocation(n);
            OnThreads(1, [&](int) { EXPECT_TRUE(Gets(way)) << "another thread's business"; });
            for (int i = 1; i <= 5; ++i) {
                EXPECT_EQ(i >= n + 1, Q_FailAllocationFired()) << "before allocation " << i;
                EXPECT_EQ(i != n, Gets(way)) << "allocation " << i;
            }
            Q_FailAllocation(0);
            EXPECT_FALSE(Q_FailAllocationFired());
            EXPECT_TRUE(Gets(way));
        }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(Memory, ThreadsThatMeetNewLabelsAgreeOnThem)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    auto const name = [](int i) { return "tests: contended " + std::to_string(i); };
    std::vector<std::vector<void*>> blocks(4);
    OnThreads(4, [&](int thread) {
        for (int i = 0; i < 60; ++i) blocks[thread].push_back(Q_AllocatePtr(1, name(i).c_str(), 10));
    });
    for (int i = 0; i < 60; ++i) EXPECT_EQ((Q_MemoryCount{40, 4}), Q_MemoryLive(name(i).c_str())) << i;
    for (std::vector<void*> const& some : blocks)
        for (void* const block : some) Q_FreePtr(block);  // on another thread than the one that allocated it
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

// ---- pointers

TEST(PointerValues, AddressesComeBackAndAreTakenForNoNumber)
{
    static std::list<std::vector<double>> kept;  // their addresses are new also when the test is repeated
    std::vector<double>& objects = kept.emplace_back(300);
    double const& probe = kept.emplace_back(1)[0];
    int const next = Q_PointerToInt32(&probe) + 1;  // where the values for addresses are taken from
    Q_PointerToInt32(Q_IntPtrToPointer(next + 2));
    Q_Int32ToPointer(next + 4);
    std::vector<int> values(objects.size());
    OnThreads(3, [&](int thread) {
        for (auto i = static_cast<std::size_t>(thread); i < objects.size(); i += 3)
            values[i] = Q_PointerToInt32(&objects[i]);
    });
    std::set<int> const different(values.begin(), values.end());
    EXPECT_EQ(objects.size(), different.size());
    EXPECT_FALSE(different.contains(next + 2) || different.contains(next + 4));
    for (std::size_t i = 0; i < objects.size(); ++i) {
        EXPECT_EQ(&objects[i], Q_Int32ToPointer(values[i]));
        EXPECT_EQ(values[i], Q_PointerToInt32(&objects[i])) << "the same again";
    }
    for (int const number : {0, 1, -1, 7, INT_MAX, INT_MIN, 123456, next + 2, next + 4}) {
        EXPECT_EQ(number, Q_PointerToInt32(Q_IntPtrToPointer(number)));
        EXPECT_EQ(Q_IntPtrToPointer(number), Q_Int32ToPointer(number));
    }
    // A number that only turns up now, and is taken already, must not become an address.
    void* const late = Q_IntPtrToPointer(*different.begin());
    EXPECT_EQ(late, Q_Int32ToPointer(Q_PointerToInt32(late)));
}

// ---- scopes

struct Counted {
    explicit Counted(int& count) : alive(count) { ++alive; }
    Counted(Counted const&) = delete;
    virtual ~Counted() { --alive; }
    int& alive;
};

struct Special : Counted {
    using Counted::Counted;
};

TEST(Scopes, DeleteWhatTheyHoldAndWriteBackHoweverTheyEnd)
{
    int alive = 0;
    {
        Q_ScAutoPtr<Counted> pointer(new Counted(alive));
        Counted* const taken = pointer.release();
        EXPECT_TRUE(pointer.get() == nullptr && alive == 1);
        pointer.reset(taken);
        pointer.reset(taken);
        EXPECT_EQ(1, alive) << "resetting to the same object keeps it";
        Q_ScAutoPtr<Counted> other(Q_ScAutoPtr<Special>(new Special(alive)));
        EXPECT_EQ(2, alive);
        other = std::move(pointer);
        EXPECT_TRUE(alive == 1 && !pointer && other.get() == taken);
    }
    EXPECT_EQ(0, alive);
    std::string text = "first", other = "other";
    try {
        Q_ScSetReset<std::string> scope;
        scope.Arm(&text);
        text = "changed";
        Q_ScSetReset<std::string> const inner(&text, "inner");
        EXPECT_EQ("inner", text);
        throw std::runtime_error("on the way out");
    } catch (std::runtime_error const&) {}
    EXPECT_EQ("first", text);
    {
        ScSetReset<std::string> scope(&text, "second");
        scope.Arm(&other);
        EXPECT_EQ("first", text) << "a scope guards one variable at a time";
        other = "changed";
        scope.Reset();
        EXPECT_EQ("other", other);
        other = "kept";
    }
    EXPECT_EQ("kept", other) << "a scope that was reset guards nothing";
}

// ---- threads and switches

TEST(Threads, HaveNumbersOfTheirOwnAndOneOfThemIsTheMainThread)
{
    std::set<std::uint64_t> ids{0, hearth::threads::GetCurrentThreadID()};
    EXPECT_TRUE(hearth::threads::CurrentThreadIsMainThread()) << "it loaded the library";
    for (int i = 0; i < 20; ++i)
        OnThreads(1, [&](int) {
            std::uint64_t const id = hearth::threads::GetCurrentThreadID();
            EXPECT_EQ(id, hearth::threads::GetCurrentThreadID());
            EXPECT_TRUE(ids.insert(id).second) << "never used again, though threads come and go";
            EXPECT_FALSE(hearth::threads::CurrentThreadIsMainThread());
            if (i < 19) return;
            hearth::threads::SetCurrentThreadAsMain();
            EXPECT_TRUE(hearth::threads::CurrentThreadIsMainThread());
        });
    EXPECT_FALSE(hearth::threads::CurrentThreadIsMainThread());
    hearth::threads::SetCurrentThreadAsMain();
    hearth::threads::RecursiveMutex mutex("tests");
    int counter = 0;  // guarded by the mutex alone
    OnThreads(3, [&](int) {
        for (int k = 0; k < 2000; ++k) {
            hearth::threads::ScRecursiveLock const outer(mutex, "outer");
            mutex.Lock("inner");
            ++counter;
            mutex.Unlock();
            ++counter;
        }
    });
    EXPECT_EQ(12000, counter);
}

TEST(DebugDatabase, ReadsSwitchesOrTheirDefaults)
{
    hearth::debug::DebugDatabase& database = hearth::debug::DebugDatabase::Instance();
    std::pair<char const*, int> const table[] = {{"1", 1}, {"true", 1},  {"yes", 1},   {"on", 1},
                                                 {"0", 0}, {"false", 0}, {"no", 0},    {"off", 0},
                                                 {"", -1}, {"TRUE", -1}, {nullptr, -1}};
    for (auto const& [text, meaning] : table)
        for (bool const fallback : {false, true}) {
            database.SetEntry("Tests.Switch", text);
            EXPECT_EQ(meaning < 0 ? fallback : meaning == 1, database.GetEntryAs<bool>("Tests.Switch", fallback));
            std::string value;
            EXPECT_EQ(text != nullptr, database.GetEntry("Tests.Switch", &value));
            EXPECT_EQ(text ? text : "", value);
        }
}

// ---- contexts

struct State : Q_RenderState {
    explicit State(char const* text) : name(ImmutableString::Create(text)) {}
    ImmutableString const& GetStateName() const override { return name; }
    ImmutableString name;
};

TEST(Context, NamesAreTheSameObjectForTheSameText)
{
    char text[] = "RenderState";
    ImmutableString const a = ImmutableString::Create(text);
    text[0] = 'X';
    EXPECT_STREQ("RenderState", a.c_str());
    EXPECT_NE(a, ImmutableString::Create("RenderStat"));
    EXPECT_TRUE(ImmutableString::Create("") == ImmutableString() &&
                ImmutableString::Create(nullptr) == ImmutableString());
    EXPECT_STREQ("", ImmutableString().c_str());
    OnThreads(1, [&](int) {
        for (int i = 0; i < 2000; ++i) ImmutableString::Create(("name " + std::to_string(i)).c_str());
        EXPECT_EQ(a.c_str(), ImmutableString::Create("RenderState").c_str()) << "it stays where it is";
    });
}

TEST(Context, ScopesNestPerThreadAndRestoreAlsoByException)
{
    std::vector<std::string> reports;
    Q_ReportSink const previous = Q_SetReportSink([&](Q_Report const& report) {
        EXPECT_EQ(Q_ReportKind::Verification, report.kind);
        reports.push_back(report.text);
    });
    auto const outer = boost::make_shared<Q_Context>(), inner = boost::make_shared<Q_Context>();
    auto const mine = Q_RenderContext::MakeNewContext(false), theirs = Q_RenderContext::MakeNewContext(true);
    EXPECT_TRUE(!mine->GetIsTempCloneContext() && theirs->GetIsTempCloneContext());
    {
        Q_ScSetCurrentContext const scope(outer);
        Q_ScSetCurrentRenderContext const render(mine);
        try {
            Q_ScSetCurrentContext const innerScope(inner);
            Q_ScSetCurrentRenderContext const innerRender(theirs);
            EXPECT_EQ(inner, Q_Context::GetCurrent(false));
            EXPECT_EQ(inner.get(), Q_Context::PeekCurrent());
            EXPECT_EQ(theirs, Q_RenderContext::GetCurrent(false));
            Q_ScSetCurrentContext const noneScope(nullptr);
            EXPECT_FALSE(Q_Context::HasCurrent());
            throw std::runtime_error("on the way out");
        } catch (std::runtime_error const&) {}
        EXPECT_EQ(outer, Q_Context::GetCurrentConst(false));
        EXPECT_EQ(mine.get(), Q_RenderContext::PeekCurrent());
        OnThreads(1, [](int) { EXPECT_TRUE(!Q_Context::HasCurrent() && !Q_RenderContext::PeekCurrent()); });
    }
    EXPECT_TRUE(!Q_Context::HasCurrent() && !Q_Context::PeekCurrent());
    EXPECT_TRUE(inner.use_count() == 1 && theirs.use_count() == 1) << "nothing keeps a reference";
    EXPECT_TRUE(!Q_Context::GetCurrent(true) && !Q_Context::GetCurrentConst(true) &&
                !Q_RenderContext::GetCurrent(true));
    EXPECT_TRUE(reports.empty());
    EXPECT_TRUE(!Q_Context::GetCurrent(false) && !Q_Context::GetCurrentConst(false));
    EXPECT_FALSE(Q_RenderContext::GetCurrent(false));
    Q_SetReportSink(previous);
    EXPECT_EQ((std::vector<std::string>{"there is no current context", "there is no current context",
                                        "there is no current render context"}),
              reports);
}

TEST(Context, KeepsOneStateOfANameAndEveryChangeHasAStampThatNoOtherHad)
{
    std::set<std::uint64_t> stamps{0};
    for (int i = 0; i < 50; ++i) {
        auto const context = Q_RenderContext::MakeNewContext(i % 2 == 0);  // the next one may lie at the same address
        ImmutableString const a = ImmutableString::Create("A"), b = ImmutableString::Create("B");
        auto const isNew = [&] { return stamps.insert(context->GetStatesStamp()).second; };
        EXPECT_TRUE(isNew() && !context->GetState(a));
        auto const first = boost::make_shared<State>("A"), second = boost::make_shared<State>("A");
        auto const other = boost::make_shared<State>("B");
        context->SetState(first);
        EXPECT_TRUE(isNew() && context->GetState(a) == first);
        context->SetState(other);
        context->SetState(second);
        EXPECT_TRUE(isNew() && context->PeekState(a) == second.get() && first.use_count() == 1) << "a replacement";
        context->RemoveState(b);
        EXPECT_TRUE(isNew() && context->PeekState(a) == second.get() && other.use_count() == 1);
        context->RemoveState(b);
        context->SetState(nullptr);
        EXPECT_TRUE(!isNew() && !context->PeekState(b)) << "what changes nothing keeps what readers remember";
    }
}

// ---- reports

using Row = std::tuple<Q_ReportKind, int, int, int, int, std::string>;  // kind, id, severity, code, line, text

TEST(Reports, CarryWhatTheCallerSaidOneAtATime)
{
    std::vector<Row> rows;
    int inside = 0, most = 0;  // unguarded on purpose: the thread sanitizer looks on
    Q_ReportSink const previous = Q_SetReportSink([&](Q_Report const& report) {
        most = std::max(most, ++inside);
        rows.emplace_back(report.kind, report.id, report.severity, report.code, report.line,
                          report.text ? report.text : "<null>");
        --inside;
    });
    std::strcpy(Qp_GetThreadLoggingBuffer(), "formatted");
    Qp_ReportError(0x1D0017, 8);
    Qp_ReportErrString(0x1D0001, 4, "text");
    EXPECT_EQ(7446, Qp_ReportLegacyErrString(0x1D0000, 8, 7446, "unknown"));
    EXPECT_EQ(3, Qp_ReportLegacyErrString(0x1D0072, 8, 3, nullptr));
    Q_ReportError(0x1D000C, 4, Q_MBToUTF16String("\xC3\xA4"));
    Q_ReportFailedVerification(0x1D000A, 997, 0, "broken");
    EXPECT_EQ(4, Q_TranslateAndReportException(std::bad_array_new_length()));
    EXPECT_EQ(Q_Err_Exception, Q_TranslateAndReportException(std::runtime_error("what it was")));
    std::vector<Row> const wanted = {
        {Q_ReportKind::Message, 0x1D0017, 8, 0, 0, "formatted"},
        {Q_ReportKind::Message, 0x1D0001, 4, 0, 0, "text"},
        {Q_ReportKind::Message, 0x1D0000, 8, 7446, 0, "unknown"},
        {Q_ReportKind::Message, 0x1D0072, 8, 3, 0, "<null>"},
        {Q_ReportKind::Message, 0x1D000C, 4, 0, 0, "\xC3\xA4"},
        {Q_ReportKind::Verification, 0x1D000A, 8, 0, 997, "broken"},
        {Q_ReportKind::Exception, 0, 8, 4, 0, std::bad_array_new_length().what()},
        {Q_ReportKind::Exception, 0, 8, Q_Err_Exception, 0, "what it was"},
    };
    EXPECT_EQ(wanted, std::exchange(rows, {}));
    OnThreads(4, [](int) {
        for (int k = 0; k < 500; ++k) Qp_ReportErrString(1, 8, "busy");
    });
    Q_SetReportSink(previous);
    EXPECT_TRUE(most == 1 && rows.size() == 2000) << most << ", " << rows.size();
}

TEST(Reports, LastErrorAndBufferAreTheThreadsOwn)
{
    Qp_SetThreadLastError(7);
    std::strcpy(Qp_GetThreadLoggingBuffer(), "mine");
    std::memset(Qp_GetThreadLoggingBuffer() + 5, 'x', Q_LoggingBufferSize - 6);  // all of it may be written
    OnThreads(1, [](int) {
        EXPECT_EQ(0, Qp_GetThreadLastError());
        EXPECT_STREQ("", Qp_GetThreadLoggingBuffer());
        Qp_SetThreadLastError(8);
        std::strcpy(Qp_GetThreadLoggingBuffer(), "other");
    });
    EXPECT_EQ(7, Qp_GetThreadLastError());
    EXPECT_STREQ("mine", Qp_GetThreadLoggingBuffer());
    Qp_SetThreadLastError(0);
}

TEST(Reports, ASinkMayThrowReportAndReplaceItself)
{
    int calls = 0;
    Q_ReportSink const previous = Q_SetReportSink([&calls, proof = std::string(100, 'x')](Q_Report const&) {
        ++calls;
        Q_SetReportSink({});
        Q_ReportFailedVerification(0, 1, 0, "from within");
        EXPECT_EQ(std::string(100, 'x'), proof) << "the closure is still there after its replacement";
        throw std::runtime_error("dropped");
    });
    testing::internal::CaptureStderr();
    Qp_ReportErrString(1, 8, "first");
    Qp_ReportErrString(0x1D0002, 8, "second");
    std::string const printed = testing::internal::GetCapturedStderr();
    Q_SetReportSink(previous);
    EXPECT_EQ(1, calls);
    EXPECT_EQ("failed verification 0x0 severity 8 code 0: from within\nreport 0x1D0002 severity 8 code 0: second\n",
              printed);
    std::vector<std::string> lines;
    XLOG_Log(10, "KFS", "Birth", "before");
    Q_LogSink const log = Q_SetLogSink([&](int level, char const* tag, char const* topic, char const* text) {
        lines.push_back(std::to_string(level) + "|" + tag + "|" + topic + "|" + text);
        XLOG_Log(0, "KFS", "again", "and again");
        if (lines.size() == 2) throw 5;
    });
    XLOG_Log(10, "KFS", "Birth", "KFS Birth");
    XLOG_Log(0, nullptr, nullptr, nullptr);
    Q_SetLogSink(log);
    XLOG_Log(10, "KFS", "Death", "after");
    EXPECT_EQ((std::vector<std::string>{"10|KFS|Birth|KFS Birth", "0|||"}), lines);
}

// ---- identifiers

std::string Hex(Guid const& guid)
{
    std::string text;
    for (unsigned char const byte : guid.GuidToBytes())
        for (int const digit : {byte >> 4, byte & 15}) text += "0123456789abcdef"[digit];
    return text;
}

template <class HashState>
Guid HashOf(std::string const& bytes)
{
    MixHashGuidT<HashState> mix;
    mix.Mix(bytes.data(), bytes.size());
    return mix.GetGuid();
}

// Published values of MurmurHash3 x64 128, each half least significant byte first, and at all lengths of the open block
// the function in one piece; of XXH3, in canonical order, the library's own one-shot function.
TEST(Identifiers, HashesAreTheKnownOnes)
{
    for (auto const& [text, digest] :
         {std::pair("", "00000000000000000000000000000000"),
          {"hello", "029bbd41b3a7d8cb191dae486a901e5b"},
          {"The quick brown fox jumps over the lazy dog", "6c1b07bc7bbc4be347939ac4a93c437a"},
          {"The quick brown fox jumps over the lazy cog", "9a2685ff70a98c653e5c8ea6eae3fe43"}})
        EXPECT_EQ(digest, Hex(HashOf<Murmur3MixerState>(text))) << text;
    std::mt19937 random(1);
    std::string all, counted(1000, 0);
    for (std::size_t size = 0; size < 100; ++size) {
        std::string bytes(size, 0);
        for (char& byte : bytes) byte = static_cast<char>(random());
        all += Hex(HashOf<Murmur3MixerState>(bytes));
    }
    EXPECT_EQ("1019aae0b6911e2c7e284eff50eceb0e", Hex(HashOf<Murmur3MixerState>(all)));
    for (std::size_t i = 0; i < 1000; ++i) counted[i] = static_cast<char>(i * 7 + i / 256);
    for (auto const& [text, digest] :
         {std::pair<std::string, char const*>("", "99aa06d3014798d86001c324468d497f"),
          {"a", "a96faf705af16834e6c632b61e964e1f"},
          {"KFS_ParamBag", "6a1af0913a0586138d044edb10064f94"},
          {"The quick brown fox jumps over the lazy dog", "ddd650205ca3e7fa24a1cc2e3a8a7651"},
          {counted, "bae798f9321bda6cd1db6a0afea2cc82"}})
        EXPECT_EQ(digest, Hex(HashOf<HashValueMixerState>(text))) << text;
}

// However the bytes are cut, however often the result is read on the way, and also by a copy that goes on on its own.
template <class HashState>
void ExpectSameHowever(std::string const& bytes, Dice& dice)
{
    MixHashGuidT<HashState> mix, numbers;
    for (std::size_t at = 0, piece; at < bytes.size(); at += piece) {
        piece = std::min<std::size_t>(static_cast<std::size_t>(dice.Below(40)), bytes.size() - at);
        ASSERT_EQ(HashOf<HashState>(bytes.substr(0, at)), mix.GetGuid());
        MixHashGuidT<HashState> copy = mix;
        UpdateHashState(mix, bytes.data() + at, piece);
        copy.Mix(bytes.data() + at, piece);
        if (piece % 2 == 0) mix = copy;
    }
    mix.Mix(nullptr, 0);
    Guid guid;
    GetHashResult(mix, guid);
    ASSERT_EQ(HashOf<HashState>(bytes), guid) << bytes.size() << " bytes";
    double const real = dice.Wild(300);
    numbers.MixNumber(77);
    numbers.MixNumber(real);
    std::string const both = std::string("M\0\0\0", 4) + std::string(reinterpret_cast<char const*>(&real), 8);
    EXPECT_EQ(HashOf<HashState>(both), numbers.GetGuid());
}

TEST(Identifiers, HashesDoNotDependOnHowTheBytesCome)
{
    Dice dice(2);
    for (int i = 0; i < 300; ++i) {
        std::string bytes(static_cast<std::size_t>(dice.Below(700)), 0);
        for (char& byte : bytes) byte = static_cast<char>(dice.Bits());
        ExpectSameHowever<Murmur3MixerState>(bytes, dice);
        ExpectSameHowever<HashValueMixerState>(bytes, dice);
    }
}

TEST(Identifiers, OrderByUnsignedBytesFromTheFirst)
{
    Dice dice(4);
    EXPECT_EQ(std::string(32, '0'), Hex(Guid()));
    for (int i = 0; i < 2000; ++i) {
        std::array<unsigned char, 16> a{};
        for (unsigned char& byte : a) byte = static_cast<unsigned char>(dice.Bits());
        auto b = a;
        std::generate(b.begin() + dice.Below(17), b.end(), [&] { return static_cast<unsigned char>(dice.Bits()); });
        EXPECT_EQ(a < b, Guid(a) < Guid(b));
        EXPECT_EQ(a == b, Guid(a) == Guid(b));
        unsigned char bytes[16];
        Guid::GuidToBytes(Guid(a), bytes);
        EXPECT_TRUE(std::equal(a.begin(), a.end(), bytes));
    }
}

}  // namespace
