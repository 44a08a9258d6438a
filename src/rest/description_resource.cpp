#include "plr/rest/description_resource.h"

#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"

namespace plr::rest {
namespace {

// What a client asks for: a path; empty for everything.
std::string_view askedFor(const PathView& path) {
    if (!path || (path.current() == "*" && !path.hasTail()))
        return {};
    return path.full().substr(static_cast<std::size_t>(path.current().data() - path.full().data()));
}

bool isAtOrBelow(std::string_view path, std::string_view above) {
    return above.empty() || PathView(path).skip(above);
}

vox::dict asDict(const ResourceDescription& description) {
    const vox::dict made = vox::dict::create();
    made["type"] = vox::string(std::string_view(description.type));
    made["doc"] = vox::string(std::string_view(description.doc));
    return made;
}

}  // namespace

DescriptionRestResource::DescriptionRestResource() = default;
DescriptionRestResource::~DescriptionRestResource() = default;

void DescriptionRestResource::describe(std::string_view path, ResourceDescription description) {
    *descriptions_.insert(path_join("/", PathView(path).full()), {}).first = std::move(description);
}

bool DescriptionRestResource::handleRestMessage_GET(RestResourceContext& context,
                                                    const PathView& path) {
    const std::string_view asked = askedFor(path);
    const vox::connection sender = context.getRawAuthorConnection();
    const vox::dict shown = vox::dict::create();
    for (const auto& [described, description] : descriptions_)
        if (isAtOrBelow(described, asked) &&
            (!sender || rules_.allows(Operation::kGet, {described}, sender)))
            shown[described.c_str()] = asDict(description);
    context.sendReplyWithValue(shown);
    return true;
}

}  // namespace plr::rest
