#include "settings_commands.h"

#include <pugixml.hpp>

#include <cstdio>
#include <memory>
#include <sstream>

#include "commands.h"
#include "documents.h"
#include "varnel/records.h"

namespace varnel::cli {

namespace {

struct SettingsLine {
    MeterOptions meter;
    std::string output;
    std::vector<std::string> items;
    bool writable = false;
    bool sync = false;
    std::string setTo;
};

// The major code of the first report in a status document; "" when there is none.
std::string firstMajor(XMLWrapper& status) {
    status.MoveToRoot();
    if (status.CountElements("ErrCode") == 0) return {};
    status.MoveToChild("ErrCode");
    std::string major = status.GetChildValue("Major");
    status.MoveToRoot();
    return major;
}

}  // namespace

XMLWrapper readSettings(MeterSession& s, const std::vector<std::string>& items, std::vector<std::string>& notes,
                        const std::string& label) {
    XMLWrapper cfg = emptyDocument(doc_kind::device_settings);
    if (!items.empty()) {
        cfg.SelectElement("Settings");
        for (const std::string& item : items) cfg.AddElement(item);
        cfg.MoveToRoot();
    }
    bool checked = false;
    s.request(label, [&](XMLWrapper& status) {
        const std::int32_t code =
            s.wrapper().getDeviceSettings(s.record(), s.deviceInfo(), cfg, items.empty(), status, checked);
        if (code != ME_SUCCESS) return code;
        // The request succeeds even when items were refused; its report tells.
        const std::string major = firstMajor(status);
        if (major == std::to_string(ME_FAIL)) return static_cast<std::int32_t>(ME_FAIL);
        if (major == std::to_string(ME_PARTIALSUCCESS)) notes = statusDescriptions(status);
        return code;
    });
    return cfg;
}

std::string withoutReadOnlyItems(const std::string& xml, std::vector<std::string>& dropped) {
    pugi::xml_document doc;
    if (!doc.load_string(xml.c_str(), pugi::parse_default | pugi::parse_declaration)) return xml;
    pugi::xml_node settings = doc.document_element().child("Settings");
    for (pugi::xml_node item = settings.first_child(); item;) {
        const pugi::xml_node next = item.next_sibling();
        if (std::string(item.attribute("Mode").value()) == "0") {
            dropped.push_back(item.name());
            settings.remove_child(item);
        }
        item = next;
    }
    std::ostringstream out;
    doc.save(out, "  ", pugi::format_default, pugi::encoding_utf8);
    return out.str();
}

void showClock(MeterSession& s) {
    const MeterClock meter = readMeterClock(s);
    const LocalTime computer = computerNow();
    std::printf("Meter clock:    %s\n", meter.now.text().c_str());
    std::printf("Computer clock: %s\n", computer.text().c_str());
    std::printf("Difference:     %s\n", differenceText(meter.now.seconds() - computer.seconds()).c_str());
    std::printf("Meter accepts:  %s to %s\n", meter.first.dateText().c_str(), meter.last.dateText().c_str());
    std::fflush(stdout);
    const std::string warning = clockWarning(meter, computer);
    if (!warning.empty()) say(warning);
}

void addSettingsCommands(CLI::App& app, int& status, ClockSetter setClock) {
    auto line = std::make_shared<SettingsLine>();

    auto* settings =
        app.add_subcommand("settings", "Print the meter's settings document: every item, or those named by --item");
    addMeterOptions(settings, line->meter);
    addOutputOption(settings, line->output);
    settings
        ->add_option("--item", line->items,
                     "Read only this item (Clock, Beep, GlucUnit, Language, Insulins, Targets...); repeatable")
        ->type_name("NAME");
    settings->add_flag("--writable", line->writable,
                       "Leave out the items the meter only reports (GlucRange, GlucCalib...): "
                       "the document 'varnel set' writes back as it is");
    settings->callback([line, &status] {
        status = MeterSession(line->meter).run([&](MeterSession& s) {
            std::vector<std::string> notes, dropped;
            std::string text = xmlText(readSettings(s, line->items, notes));
            if (line->writable) text = withoutReadOnlyItems(text, dropped);
            emit(line->output, text);
            for (const std::string& note : notes) say(note);
        });
    });

    auto* clock = app.add_subcommand("clock", "Show the meter clock beside the computer clock, with the difference");
    addMeterOptions(clock, line->meter);
    if (setClock) {
        auto* sync = clock->add_flag("--sync", line->sync, "First set the meter clock to the computer clock");
        clock->add_option("--set", line->setTo, "First set the meter clock to this local time (a T may stand for the blank)")
            ->type_name("\"YYYY-MM-DD hh:mm:ss\"")
            ->check([](const std::string& text) {
                std::string why;
                parseLocalTime(text, &why);
                return why;
            })
            ->excludes(sync);
    }
    clock->callback([line, &status, setClock] {
        status = MeterSession(line->meter).run([&](MeterSession& s) {
            if (line->sync) setClock(s, computerNow());
            if (!line->setTo.empty()) setClock(s, *parseLocalTime(line->setTo));
            showClock(s);
        });
    });
}

}  // namespace varnel::cli
