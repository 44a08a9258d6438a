// ZeroMQ over ipc://, blobs without structure: PAIR for round trips, PUSH and
// PULL one way (the fastest patterns that fit). One I/O thread each.

#include <zmq.h>

#include <cstddef>
#include <string>
#include <vector>

#include "bench/vox_cases.h"

namespace {

using bench::check;

constexpr int kHighWaterMark = 10'000;  // messages; faster one way than its default of 1,000

class Socket {
  public:
    Socket(void* context, int type) : socket_(::zmq_socket(context, type)) {
        if (!socket_)
            bench::fail("zmq_socket");
        for (const int option : {ZMQ_SNDHWM, ZMQ_RCVHWM})
            check(::zmq_setsockopt(socket_, option, &kHighWaterMark, sizeof kHighWaterMark),
                  "zmq_setsockopt");
    }
    Socket(const Socket&) = delete;
    Socket& operator=(const Socket&) = delete;
    ~Socket() { ::zmq_close(socket_); }

    void bind(const std::string& address) {
        check(::zmq_bind(socket_, address.c_str()), "zmq_bind");
    }
    void connect(const std::string& address) {
        check(::zmq_connect(socket_, address.c_str()), "zmq_connect");
    }
    void send(const std::vector<char>& bytes) {
        check(::zmq_send(socket_, bytes.data(), bytes.size(), 0), "zmq_send");
    }
    void receive() {
        ::zmq_msg_t message;
        ::zmq_msg_init(&message);
        check(::zmq_msg_recv(&message, socket_, 0), "zmq_msg_recv");
        ::zmq_msg_close(&message);
    }

  private:
    void* socket_;
};

void serve(const bench::vox_cases::Case& measured, const std::string& address) {
    void* context = ::zmq_ctx_new();
    Socket pair(context, ZMQ_PAIR);
    pair.bind(address);
    const std::vector<char> frame(measured.frameBytes());
    if (measured.roundTrip)
        for (;;) {
            pair.receive();
            pair.send(frame);
        }
    Socket pull(context, ZMQ_PULL);
    pull.bind(address + "-push");
    pair.receive();
    for (std::uint64_t n = 0; n < measured.messages(); ++n)
        pull.receive();
    pair.send(frame);
    pair.receive();  // until killed
}

}  // namespace

int main(int argc, char** argv) {
    const auto measured = bench::vox_cases::parse(argc, argv);
    const bench::TemporaryFolder folder;
    const std::string address = "ipc://" + folder.path() + "/socket";
    const bench::Child server([&] {
        measured.place(true);
        serve(measured, address);
    });
    measured.place(false);
    void* context = ::zmq_ctx_new();
    Socket pair(context, ZMQ_PAIR);
    pair.connect(address);
    const std::vector<char> frame(measured.frameBytes());
    if (measured.roundTrip) {
        bench::vox_cases::measureRoundTrips(measured, [&] {
            pair.send(frame);
            pair.receive();
        });
        return 0;
    }
    Socket push(context, ZMQ_PUSH);
    push.connect(address + "-push");
    pair.send(frame);
    bench::vox_cases::measureOneWay(
        measured, [&] { push.send(frame); }, [&] { pair.receive(); });
}
