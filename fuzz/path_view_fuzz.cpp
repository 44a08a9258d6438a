#include "plr/rest/path_view.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

// PathView over any path, moved about by any steps: what it shows lies inside
// the path and fits together. The input is a path, a zero byte, then one byte a
// move.
namespace {

using plr::rest::path_join;
using plr::rest::PathView;

void check(bool holds) {
    if (!holds)
        std::abort();
}

bool isInside(std::string_view part, std::string_view whole) {
    return part.data() >= whole.data() && part.data() + part.size() <= whole.data() + whole.size();
}

void checkView(const PathView& view) {
    const std::string_view full = view.full();
    const std::string_view current = view.current();
    check(isInside(current, full) && isInside(view.head(), full) && isInside(view.tail(), full));
    check(current.find('/') == std::string_view::npos);
    check(static_cast<bool>(view) == !current.empty());
    if (!view) {
        check(view.head() == full && view.tail().empty() && !view.hasTail());
        return;
    }
    check(view.hasTail() == !view.tail().empty());
    // The three parts make up the path again, but for an empty segment around.
    std::string joined = path_join(view.head(), current);
    if (view.tail().empty())
        check(full == joined || full == joined + "/" || view.head().ends_with('/'));
    else
        check(full == joined + "/" + std::string(view.tail()) || view.head().ends_with('/'));
    // Its own segment is a prefix that can be skipped, which is one step.
    PathView skipped = view;
    PathView stepped = view;
    stepped.advance(1);
    check(skipped.skip(current));
    check(skipped.current().data() == stepped.current().data());
    check(skipped.current() == stepped.current());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string input(reinterpret_cast<const char*>(data), size);
    const std::size_t end = std::min(input.find('\0'), size);
    const std::string path = input.substr(0, end);
    PathView view(path);
    checkView(view);
    for (std::size_t i = end + 1; i < size; ++i) {
        const auto move = static_cast<std::int8_t>(input[i]);
        if (move % 4 == 3)
            view.skip(std::string_view(path).substr(static_cast<std::uint8_t>(move) % (end + 1)));
        else
            view.advance(move / 4);
        checkView(view);
    }
    return 0;
}
