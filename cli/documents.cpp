#include "documents.h"

#include <string>

namespace varnel::cli {

XMLWrapper connectionDocument(int port) {
    XMLWrapper doc = emptyDocument(doc_kind::connection_info);
    doc.SelectElement("Ports");
    doc.AddElement("COM");
    doc.AddChildElement("PortsToSearch", "", std::to_string(port));
    doc.MoveToRoot();
    return doc;
}

XMLWrapper emptyDocument(int kind) {
    XMLWrapper doc;
    doc.InitDocument(kind);
    return doc;
}

std::vector<std::string> statusDescriptions(XMLWrapper& status) {
    std::vector<std::string> texts;
    if (status.IsEmpty()) return texts;
    // Requests append their groups where the document stood; a new status document stands at its root.
    status.MoveToRoot();
    for (std::int32_t i = 0, n = status.GetChildCount(); i < n; ++i)
        if (status.GetChildName(i) == "ErrDesc") texts.push_back(status.GetChildValueAt(i));
    return texts;
}

std::string sectionValue(XMLWrapper& document, const std::string& section, const std::string& name) {
    if (document.IsEmpty()) return {};
    document.MoveToRoot();
    if (document.GetRootName() != section && document.CountElements(section) == 0) return {};
    document.SelectElement(section);
    std::string value = document.GetChildValue(name);
    document.MoveToRoot();
    return value;
}

}  // namespace varnel::cli
