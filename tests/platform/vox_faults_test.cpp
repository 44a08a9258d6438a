// A whole session, again and again, each time with another of its system calls
// failing.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/stat.h>

#include <atomic>
#include <cerrno>
#include <memory>
#include <optional>
#include <ostream>
#include <string>

#include "support/system_faults.h"
#include "support/vox_service.h"

namespace {

using namespace plr::test;
using faults::Call;

constexpr const char* kName = "net.example.faults";
constexpr std::int64_t kMessages = 12;
constexpr std::int64_t kBig = 5;               // this one's number
constexpr std::size_t kBigBytes = 600u << 10;  // more than a socket's buffer
constexpr std::int64_t kAnswered = 100;
constexpr std::int64_t kUnanswered = 101;

bool carriesDescriptors(std::int64_t n) {
    return n == 3 || n == 8;
}
std::size_t bytesOf(std::int64_t n) {
    return n == kBig ? kBigBytes : 10;
}

// The file whose descriptors are sent.
int sentFile() {
    static const int file = ::memfd_create("sent", MFD_CLOEXEC);
    return file;
}
ino_t identity(int fd) {
    struct stat found {};
    EXPECT_EQ(::fstat(fd, &found), 0);
    return found.st_ino;
}
bool isSentFile(vox_object_t value) {
    if (vox_get_type(value) != VOX_TYPE_FD)
        return false;
    const int fd = vox_fd_dup(value);
    const bool same = fd >= 0 && identity(fd) == identity(sentFile());
    ::close(fd);
    return same;
}

// Client and service in this process, from the first system call to the last.
class Session {
  public:
    Session() {
        listener_.resume([this](vox_object_t event) { return take(event); });
        client_.emplace(vox_connection_create(kName));
        client_->resume();
        sendAll(*client_, fromClient_);
        client_->request(message(kAnswered), answer_);
        client_->request(message(kUnanswered), unanswered_);
        const dispatch::block<void()> barrier([this] { ++barriers_; });
        vox_connection_send_barrier(*client_, &barrier);
    }

    // Until each side has everything, or the connection has failed; then its end.
    // Returns whether it was complete.
    bool run() {
        EXPECT_TRUE(eventually([this] { return isComplete() || hasFailed(); }));
        const bool complete = !hasFailed();
        if (complete) {
            useEndpoint();
            vox_connection_cancel(*client_);
        }
        EXPECT_TRUE(client_->inbox.waitForError());
        End* server = serverNow();
        EXPECT_TRUE(!server || server->inbox.waitForError());
        drain(client_->queue);
        EXPECT_EQ(answer_.all().size(), 1u);
        EXPECT_EQ(unanswered_.all().size(), 1u);
        EXPECT_EQ(barriers_, 1);
        return complete;
    }
    // What came is the beginning of what was sent, unchanged.
    void expectRightMessages() {
        expectRight(client_->inbox, fromServer_);
        if (End* server = serverNow())
            expectRight(server->inbox, fromClient_);
    }

  private:
    struct Sent {
        Numbers accepted;
        std::atomic<bool> all{false};
    };

    bool take(vox_object_t event) {
        if (vox_get_type(event) != VOX_TYPE_CONNECTION)
            return false;
        auto made = std::make_unique<End>(vox_retain(event));
        End& server = *made;
        {
            const std::lock_guard guard(lock_);
            server_ = std::move(made);
        }
        server.resume([this, &server](vox_object_t message) { return serve(server, message); });
        return true;
    }
    bool serve(End& server, vox_object_t message) {
        if (vox_get_type(message) != VOX_TYPE_DICTIONARY)
            return false;
        if (numberIn(message) == kAnswered) {
            sendAll(server, fromServer_);
            static_cast<void>(server.answer(message));
        }
        return numberIn(message) >= kAnswered;
    }

    void sendAll(End& from, Sent& sent) {
        for (std::int64_t n = 0; n < kMessages; ++n) {
            const Ref made = message(n, bytesOf(n));
            vox_dictionary_set_value(made, "e", Ref(vox_endpoint_create(hidden_.listener())));
            bool whole = true;
            for (const char* key : {"f", "g"}) {
                const Ref file(vox_fd_create(sentFile()));
                whole = whole && (!carriesDescriptors(n) || isSentFile(file));
                vox_dictionary_set_value(made, key, carriesDescriptors(n) ? file : Ref());
            }
            if (whole && from.send(made) == 0)
                sent.accepted.push_back(n);
        }
        sent.all = true;
    }
    void useEndpoint() {
        const std::vector<Ref> events = client_->inbox.all();
        const vox_object_t endpoint =
            events.empty() ? nullptr : vox_dictionary_get_value(events.back(), "e");
        if (vox_get_type(endpoint) != VOX_TYPE_ENDPOINT)
            return;
        Inbox answer;
        Client direct(vox_connection_create_from_endpoint(endpoint));
        direct.request(message(42), answer);
        EXPECT_TRUE(answer.wait(1));
        EXPECT_TRUE(answer.numbers() == Numbers{42} || direct.inbox.waitForError());
    }

    [[nodiscard]] End* serverNow() {
        const std::lock_guard guard(lock_);
        return server_.get();
    }
    [[nodiscard]] static bool hasAll(End& at, const Sent& sent) {
        return sent.all && at.inbox.numbers() == sent.accepted;
    }
    [[nodiscard]] bool isComplete() {
        End* server = serverNow();
        return server && hasAll(*client_, fromServer_) && hasAll(*server, fromClient_) &&
               answer_.all().size() == 1 && barriers_ == 1;
    }
    [[nodiscard]] static bool isOver(End& end) {
        const std::vector<Ref> events = end.inbox.all();
        return !events.empty() && vox_get_type(events.back()) == VOX_TYPE_ERROR;
    }
    [[nodiscard]] bool hasFailed() {
        End* server = serverNow();
        return isOver(*client_) || (server && isOver(*server));
    }

    static void expectRight(const Inbox& inbox, const Sent& sent) {
        const Numbers came = inbox.numbers();
        ASSERT_LE(came.size(), sent.accepted.size());
        EXPECT_TRUE(std::equal(came.begin(), came.end(), sent.accepted.begin()));
        for (std::size_t i = 0; i < came.size(); ++i) {
            const vox_object_t message = inbox[i];
            EXPECT_EQ(vox_data_get_length(vox_dictionary_get_value(message, "data")),
                      bytesOf(came[i]));
            for (const char* key : {"f", "g"})
                EXPECT_EQ(isSentFile(vox_dictionary_get_value(message, key)),
                          carriesDescriptors(came[i]));
        }
    }

    EchoService hidden_{vox_connection_create_anonymous_listener(nullptr)};
    std::mutex lock_;
    std::unique_ptr<End> server_;
    std::optional<End> client_;
    End listener_{vox_connection_create_listener(kName, nullptr)};
    Sent fromClient_;
    Sent fromServer_;
    Inbox answer_;
    Inbox unanswered_;
    std::atomic<int> barriers_{0};
};

struct Row {
    const char* name;
    Call call;
    int fault;
};
[[maybe_unused]] void PrintTo(const Row& row, std::ostream* out) {
    *out << row.name;
}

// Whether nobody is to notice.
bool passes(const Row& row) {
    switch (row.fault) {
        case faults::kOneByte:
        case EINTR:
        case EAGAIN:
        case ECONNABORTED:
        case ETOOMANYREFS:
            return true;
        case ENOBUFS:
        case ENOMEM:
            return row.call == Call::send || row.call == Call::accept;
        default:
            return false;
    }
}

class VoxFaults : public ::testing::TestWithParam<Row> {
  protected:
    static void SetUpTestSuite() {
        plr::setReportHook([](const char*) noexcept {});
        Session first;  // makes what the process has once
        EXPECT_TRUE(first.run());
    }
    static void TearDownTestSuite() { plr::setReportHook(nullptr); }

    static inline const RuntimeDirectory directory;
};

TEST_P(VoxFaults, NeitherCrashNorLeakNorMisleadAnyEnd) {
    const Row& row = GetParam();
    const std::size_t before = openDescriptors();
    bool came = true;
    std::size_t n = 0;
    while (came && !HasFailure()) {
        SCOPED_TRACE("call " + std::to_string(++n));
        faults::arm(row.call, row.fault, n);
        {
            Session session;
            EXPECT_TRUE(session.run() || !passes(row));
            came = faults::disarm();
            session.expectRightMessages();
        }
        EXPECT_TRUE(eventually([before] { return openDescriptors() == before; }));
    }
    EXPECT_GT(n, 1u) << "the call was never made";
    RecordProperty("calls", static_cast<int>(n - 1));
}

INSTANTIATE_TEST_SUITE_P(
    , VoxFaults,
    ::testing::Values(
        Row{"sendMovesOneByte", Call::send, faults::kOneByte}, Row{"sendEINTR", Call::send, EINTR},
        Row{"sendEAGAIN", Call::send, EAGAIN}, Row{"sendENOBUFS", Call::send, ENOBUFS},
        Row{"sendENOMEM", Call::send, ENOMEM}, Row{"sendETOOMANYREFS", Call::send, ETOOMANYREFS},
        Row{"sendEPIPE", Call::send, EPIPE}, Row{"sendECONNRESET", Call::send, ECONNRESET},
        Row{"receiveMovesOneByte", Call::receive, faults::kOneByte},
        Row{"receiveLosesDescriptors", Call::receive, faults::kNoDescriptors},
        Row{"receiveEINTR", Call::receive, EINTR}, Row{"receiveEAGAIN", Call::receive, EAGAIN},
        Row{"receiveENOMEM", Call::receive, ENOMEM},
        Row{"receiveECONNRESET", Call::receive, ECONNRESET},
        Row{"acceptEINTR", Call::accept, EINTR}, Row{"acceptEAGAIN", Call::accept, EAGAIN},
        Row{"acceptECONNABORTED", Call::accept, ECONNABORTED},
        Row{"acceptEMFILE", Call::accept, EMFILE}, Row{"acceptENFILE", Call::accept, ENFILE},
        Row{"acceptENOMEM", Call::accept, ENOMEM}, Row{"acceptENOBUFS", Call::accept, ENOBUFS},
        Row{"socketEMFILE", Call::socket, EMFILE}, Row{"socketENFILE", Call::socket, ENFILE},
        Row{"socketENOMEM", Call::socket, ENOMEM}, Row{"socketENOBUFS", Call::socket, ENOBUFS},
        Row{"connectEINTR", Call::connect, EINTR}, Row{"connectEAGAIN", Call::connect, EAGAIN},
        Row{"connectENOMEM", Call::connect, ENOMEM},
        Row{"connectECONNREFUSED", Call::connect, ECONNREFUSED},
        Row{"bindENOMEM", Call::bind, ENOMEM}, Row{"lockEINTR", Call::lock, EINTR},
        Row{"lockENOLCK", Call::lock, ENOLCK}, Row{"openEMFILE", Call::open, EMFILE},
        Row{"openENOMEM", Call::open, ENOMEM}, Row{"duplicateEMFILE", Call::duplicate, EMFILE},
        Row{"watchENOMEM", Call::watch, ENOMEM}, Row{"watchENOSPC", Call::watch, ENOSPC},
        Row{"waitEINTR", Call::wait, EINTR}),
    [](const auto& row) { return std::string(row.param.name); });

}  // namespace
