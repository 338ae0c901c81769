// Comment codes attached to a glucose result, one comment per code.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace varnel::detail {

// One comment: its code (Id), a value, a label and whether the user may edit it.
class Comment {
public:
    std::int32_t Value() const { return value_; }
    void setValue(std::int32_t v) { value_ = v; }
    const std::string& Label() const { return label_; }
    void setLabel(std::string v) { label_ = std::move(v); }
    std::int32_t Id() const { return id_; }
    void setId(std::int32_t v) { id_ = v; }
    bool Editable() const { return editable_; }
    void setEditable(bool v) { editable_ = v; }

private:
    std::int32_t value_ = 0;
    std::string label_;
    std::int32_t id_ = 0;
    bool editable_ = false;
};

using CommentPtr = std::shared_ptr<Comment>;

// Keyed, ordered comments; positions are 1-based and keys ignore letter case.
class CommentsCollection {
public:
    std::int32_t ResultId() const { return resultId_; }
    void setResultId(std::int32_t v) { resultId_ = v; }

    // Adds a comment for code id under strKey (or the code as decimal text when strKey is
    // empty); nothing is added and nullptr returned when a comment with that code exists.
    // enmFlag is accepted for callers' sake and not kept.
    CommentPtr Add(std::int32_t lngId, std::int32_t enmValue, std::int32_t enmFlag,
                   const std::string& strLabel = {}, bool blnEditable = false,
                   const std::string& strKey = {});

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

    std::int32_t resultId_ = 0;
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
