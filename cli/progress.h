// Progress of the running request on standard error: a bar on a terminal, plain lines otherwise.
#pragma once

#include <cstdio>
#include <string>

namespace varnel::cli {

class Progress {
public:
    enum class Style { none, bar, lines };

    // The style suited to `stream`: a bar when it is a terminal, lines otherwise, none when quiet.
    static Style styleFor(std::FILE* stream, bool quiet);

    Progress(std::FILE* stream, Style style) : stream_(stream), style_(style) {}
    ~Progress() { finish(); }
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    // Starts reporting a new request under `label`.
    void start(const std::string& label);
    // A percentage from the component (values outside 0-100 are clamped).
    void update(int percent);
    // Ends the current bar line, if one was drawn.
    void finish();
    // The request succeeded: a progress shown so far ends at 100%, then finish().
    void complete();

private:
    void draw(int percent);

    std::FILE* stream_;
    Style style_;
    std::string label_;
    int last_ = -1;
    bool drawn_ = false;
};

}  // namespace varnel::cli
