#include "caps_command.h"

#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "commands.h"
#include "documents.h"
#include "varnel/component_error.h"
#include "varnel/records.h"

namespace varnel::cli {

namespace {

struct CapsLine {
    MeterOptions meter;
    std::string output;
    std::vector<std::string> items, records;

    bool everything() const { return items.empty() && records.empty(); }
};

// The capabilities document a client passes in: the names it asks about, if any.
// A name that cannot be an element name throws ComponentError.
XMLWrapper listing(const CapsLine& line) {
    XMLWrapper caps = emptyDocument(doc_kind::device_caps);
    for (auto [section, names] : {std::pair{"Settings", &line.items}, std::pair{"Records", &line.records}}) {
        caps.SelectElement(section);
        for (const std::string& name : *names) caps.AddElement(name);
    }
    caps.MoveToRoot();
    return caps;
}

void describe(MeterSession& s, const CapsLine& line, XMLWrapper& caps) {
    std::vector<std::string> notes;
    bool checked = false;
    s.request("caps", [&](XMLWrapper& status) {
        const std::int32_t code =
            s.wrapper().getDeviceCaps(s.record(), s.deviceInfo(), caps, line.everything(), status, checked);
        // Some names were refused: the others are described, and the refusals noted.
        if (code != ME_PARTIALSUCCESS) return code;
        notes = statusDescriptions(status);
        return static_cast<std::int32_t>(ME_SUCCESS);
    });
    emit(line.output, xmlText(caps));
    for (const std::string& note : notes) say(note);
}

}  // namespace

void addCapsCommand(CLI::App& app, int& status) {
    auto line = std::make_shared<CapsLine>();
    auto* caps = app.add_subcommand(
        "caps", "Print what the meter can do: its settings with their limits, and the record kinds it keeps");
    addMeterOptions(caps, line->meter, "--record-session");
    addOutputOption(caps, line->output);
    caps->add_option("--item", line->items,
                     "Describe only this setting (Clock, Beep, Language, Targets...); repeatable")
        ->type_name("NAME");
    caps->add_option("--record", line->records, "Describe only this record kind (Gluc, Ins, Food...); repeatable")
        ->type_name("NAME");
    caps->callback([line, &status] {
        XMLWrapper doc;
        try {
            doc = listing(*line);
        } catch (const ComponentError&) {
            say("--item and --record take setting and record names, such as Clock or Gluc");
            status = exit_status::usage;
            return;
        }
        status = MeterSession(line->meter).run([&](MeterSession& s) { describe(s, *line, doc); });
    });
}

}  // namespace varnel::cli
