// Boost.Asio strands on a thread_pool: the usual serial queue of C++ programs.

#include <boost/asio/post.hpp>
#include <boost/asio/strand.hpp>
#include <boost/asio/thread_pool.hpp>
#include <utility>

#include "bench/dispatch_cases.h"

namespace {

struct AsioPeer {
    explicit AsioPeer(unsigned workers) : pool(workers) {}

    using Strand = boost::asio::strand<boost::asio::thread_pool::executor_type>;

    class Queue {
      public:
        explicit Queue(AsioPeer& peer) : strand_(boost::asio::make_strand(peer.pool)) {}
        template <class Callable>
        void post(Callable&& work) {
            boost::asio::post(strand_, std::forward<Callable>(work));
        }

      private:
        Strand strand_;
    };

    boost::asio::thread_pool pool;
};

}  // namespace

int main(int argc, char** argv) {
    return bench::dispatch_cases::run<AsioPeer>(argc, argv);
}
