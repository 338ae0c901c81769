// varnel: talks to a meter of the Corvia family through the Varnel component.
#include <CLI/CLI.hpp>

#include <cstdio>
#include <string>

#include "varnel/records.h"
#include "varnel/return_codes.h"

namespace {

// Every return code the component gives, with its text: what an exit status means.
int listCodes() {
    for (int code = 0; code >= ME_INVALID_HANDLE; --code) {
        std::string text = varnel::returnCodeText(code);
        if (code != ME_SUCCESS && text == "Unknown status" && code != ME_UNKNOWN && code != ME_CLOCK_ERROR)
            continue;
        std::printf("%4d  %s\n", code, text.c_str());
    }
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    CLI::App app{"varnel: talk to a meter of the Corvia family (simulated by default)"};
    app.require_subcommand(1);
    auto* codes = app.add_subcommand("codes", "List every return code with its text");
    codes->callback([] { std::exit(listCodes()); });
    CLI11_PARSE(app, argc, argv);
    return 0;
}
