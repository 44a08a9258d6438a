#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <string>

#include "Pelorin"
#include "support/debug_records.h"
#include "support/waiting.h"

namespace {

using plr::test::DebugRecords;

TEST(DebugPrint, GoesToStandardErrorWithoutADelegate) {
    { const DebugRecords records; }
    testing::internal::CaptureStderr();
    PelorinDebugPrint("open", "failed with %d\n", 7);
    PelorinDebugPrint("close", "no line feed");
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "open: failed with 7\nclose: no line feed\n");
}

TEST(DebugPrint, CutsTheTextAndKeepsErrno) {
    DebugRecords records;
    errno = EBUSY;
    PelorinDebugPrint("f", "%s", std::string(2000, 'x').c_str());
    EXPECT_EQ(errno, EBUSY);
    EXPECT_EQ(records.take().at(0), "f: " + std::string(1023, 'x'));
}

TEST(DebugPrint, ADelegateMayPrint) {
    std::string got;
    PelorinDebugSetDelegate(
        [](void* context, const char* function, const char* text) {
            static_cast<std::string*>(context)->append(text);
            if (std::string(function) == "outer")
                PelorinDebugPrint("inner", "nested,");
        },
        &got);
    PelorinDebugPrint("outer", "first,");
    PelorinDebugPrint("outer", "second,");
    PelorinDebugSetDelegate(nullptr, nullptr);
    EXPECT_EQ(got, "first,nested,second,nested,");
}

TEST(DebugPrint, AReplacedDelegateIsCalledNoMoreWhileThreadsPrint) {
    struct Delegate {
        std::atomic<int> calls = 0;
        std::atomic<bool> replaced = false;
        std::atomic<bool> calledLate = false;
    };
    const PelorinDebugDelegate quiet = [](void*, const char*, const char*) {};
    PelorinDebugSetDelegate(quiet, nullptr);
    std::atomic<bool> stop = false;
    plr::test::Threads threads(3, [&stop](unsigned) {
        while (!stop)
            PelorinDebugPrint("thread", "text");
    });
    std::array<Delegate, 200> delegates;
    for (Delegate& delegate : delegates) {
        PelorinDebugSetDelegate(
            [](void* context, const char*, const char*) {
                auto& self = *static_cast<Delegate*>(context);
                self.calls++;
                std::this_thread::yield();
                if (self.replaced)
                    self.calledLate = true;
            },
            &delegate);
        while (delegate.calls == 0)
            std::this_thread::yield();
        PelorinDebugSetDelegate(quiet, nullptr);
        delegate.replaced = true;
    }
    stop = true;
    threads.join();
    PelorinDebugSetDelegate(nullptr, nullptr);
    for (const Delegate& delegate : delegates)
        EXPECT_FALSE(delegate.calledLate);
}

}  // namespace
