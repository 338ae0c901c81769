// Comment codes attached to a glucose result, one comment per code.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace varnel::detail {

// One comment: its code (Id) and a value.
class Comment {
public:
    std::int32_t Value() const { return value_; }
    void setValue(std::int32_t v) { value_ = v; }
    std::int32_t Id() const { return id_; }
    void setId(std::int32_t v) { id_ = v; }

private:
    std::int32_t value_ = 0;
    std::int32_t id_ = 0;
};

using CommentPtr = std::shared_ptr<Comment>;

// Keyed, ordered comments; positions are 1-based and keys ignore letter case.
class CommentsCollection {
public:
    // Adds a comment for code id under strKey (or the code as decimal text when strKey is
    // empty); nothing is added and nullptr returned when a comment with that code exists.
    CommentPtr Add(std::int32_t lngId, std::int32_t enmValue, const std::string& strKey = {});

    // The comment at a 1-based position or under a key; nullptr when there is none.
    CommentPtr Item(std::int32_t index) const;
    CommentPtr Item(std::string_view key) const;

    // Removes the comment at a position or under a key; an unknown one raises a subscript error.
    void Remove(std::int32_t index);
    void Remove(std::string_view key);

    std::int32_t Count() const { return static_cast<std::int32_t>(entries_.size()); }

    // Enumeration yields the comments in order.
    class iterator;
    iterator begin() const;
    iterator end() const;

private:
    struct Entry {
        std::string key;
        CommentPtr comment;
    };
    std::vector<Entry>::const_iterator find(std::string_view key) const;

    std::vector<Entry> entries_;
};

class CommentsCollection::iterator {
public:
    using value_type = CommentPtr;
    using difference_type = std::ptrdiff_t;
    iterator() = default;
    explicit iterator(std::vector<Entry>::const_iterator it) : it_(it) {}
    const CommentPtr& operator*() const { return it_->comment; }
    iterator& operator++() {
        ++it_;
        return *this;
    }
    iterator operator++(int) {
        iterator old = *this;
        ++it_;
        return old;
    }
    bool operator==(const iterator&) const = default;

private:
    std::vector<Entry>::const_iterator it_;
};

inline CommentsCollection::iterator CommentsCollection::begin() const { return iterator(entries_.begin()); }
inline CommentsCollection::iterator CommentsCollection::end() const { return iterator(entries_.end()); }

}  // namespace varnel::detail
