#include "readings/comments.h"

#include <algorithm>

#include "errors/err_propagator.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

// Raised when a key is already taken by another comment.
constexpr std::int32_t kDuplicateKey = 457;

}  // namespace

CommentPtr CommentsCollection::Add(std::int32_t lngId, std::int32_t enmValue, const std::string& strKey) {
    return guarded("CommentsCollection", "Add", [&]() -> CommentPtr {
        for (const Entry& e : entries_)
            if (e.comment->Id() == lngId) return nullptr;
        auto comment = std::make_shared<Comment>();
        comment->setId(lngId);
        comment->setValue(enmValue);
        std::string key = strKey.empty() ? std::to_string(lngId) : strKey;
        if (find(key) != entries_.end())
            raise(kDuplicateKey, "This key is already associated with an element of this collection");
        entries_.push_back({std::move(key), comment});
        return comment;
    });
}

std::vector<CommentsCollection::Entry>::const_iterator CommentsCollection::find(std::string_view key) const {
    return std::find_if(entries_.begin(), entries_.end(), [&](const Entry& e) { return EqualsNoCase(e.key, key); });
}

CommentPtr CommentsCollection::Item(std::int32_t index) const {
    if (index < 1 || index > Count()) return nullptr;
    return entries_[static_cast<std::size_t>(index - 1)].comment;
}

CommentPtr CommentsCollection::Item(std::string_view key) const {
    auto it = find(key);
    return it == entries_.end() ? nullptr : it->comment;
}

void CommentsCollection::Remove(std::int32_t index) {
    if (index < 1 || index > Count()) raise(errc::subscript_out_of_range, "Subscript out of range");
    entries_.erase(entries_.begin() + (index - 1));
}

void CommentsCollection::Remove(std::string_view key) {
    auto it = find(key);
    if (it == entries_.end()) raise(errc::subscript_out_of_range, "Subscript out of range");
    entries_.erase(it);
}

}  // namespace varnel::detail
