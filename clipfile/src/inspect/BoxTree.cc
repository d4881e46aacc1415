#include "inspect/BoxTree.h"

#include <array>
#include <string>
#include <vector>

#include "reader/BigEndian.h"
#include "reader/BoxFields.h"

namespace clipfile {

namespace {

using Json = nlohmann::ordered_json;

/// Visits boxes together with the type of the box around each.
template <typename Visit>
void VisitBoxes(const InputFile& file, Visit visit) {
    std::array<std::uint32_t, kMaxDepth + 1> types = {};  // of the boxes around the current one, by depth
    std::size_t count = 0;
    WalkTree(file, [&](const TreeItem& item) {
        const auto depth = static_cast<std::size_t>(item.depth);
        types[depth + 1] = item.box.type;
        if (count++ == kMaxBoxes) {
            TreeItem rest;
            rest.box.offset = item.box.offset;
            rest.fault = "The file has more boxes than are listed here.";
            visit(rest, 0U);
            return false;
        }
        visit(item, types[depth]);
        return true;
    });
}

void PrintFields(std::ostream& out, const std::string& indent, const std::vector<Field>& fields) {
    if (fields.empty()) {
        return;
    }
    out << indent;
    for (std::size_t i = 0; i < fields.size(); ++i) {
        out << (i == 0 ? "" : ", ") << fields[i].name << ' ' << FieldText(fields[i]);
    }
    out << '\n';
}

Json ToJson(const std::vector<Field>& fields) {
    Json json = Json::object();
    for (const Field& field : fields) {
        const Json value = std::visit([](const auto& held) { return Json(held); }, field.value);
        // A name that comes again, as that of parameter sets, becomes an array.
        if (!json.contains(field.name)) {
            json[field.name] = value;
        } else if (json[field.name].is_array()) {
            json[field.name].push_back(value);
        } else {
            json[field.name] = Json::array({json[field.name], value});
        }
    }
    return json;
}

Json ToJson(const InputFile& file, const TreeItem& item, std::uint32_t parent, std::size_t maxRows) {
    Json json = {{"type", FourCcText(item.box.type)}, {"offset", item.box.offset}, {"size", item.box.size}};
    if (item.box.IsTorn()) {
        json["torn"] = true;
    }
    const BoxFields fields = ReadBoxFields(file, item.box, parent, maxRows);
    if (!fields.fields.empty()) {
        json["fields"] = ToJson(fields.fields);
    }
    if (fields.rowCount != 0) {
        json["row_count"] = fields.rowCount;
        json["rows"] = Json::array();
        for (const auto& row : fields.rows) {
            json["rows"].push_back(ToJson(row));
        }
    }
    return json;
}

}  // namespace

void PrintBoxes(std::ostream& out, const InputFile& file, std::size_t maxRows) {
    VisitBoxes(file, [&](const TreeItem& item, std::uint32_t parent) {
        const std::string indent(2 * static_cast<std::size_t>(item.depth), ' ');
        if (!item.fault.empty()) {
            out << indent << item.fault << '\n';
            return;
        }
        out << indent << FourCcText(item.box.type) << " at " << item.box.offset << ", " << item.box.size
            << (item.box.IsTorn() ? " bytes, torn\n" : " bytes\n");
        const BoxFields fields = ReadBoxFields(file, item.box, parent, maxRows);
        PrintFields(out, indent + "    ", fields.fields);
        for (const auto& row : fields.rows) {
            PrintFields(out, indent + "      ", row);
        }
        if (fields.rowCount > fields.rows.size()) {
            out << indent << "      " << fields.rowCount - fields.rows.size() << " more rows\n";
        }
    });
}

Json BoxesToJson(const InputFile& file, std::size_t maxRows) {
    Json root = Json::array();
    VisitBoxes(file, [&](const TreeItem& item, std::uint32_t parent) {
        Json* list = &root;
        for (int depth = 0; depth < item.depth && !list->empty(); ++depth) {
            list = &list->back()["children"];
        }
        list->push_back(item.fault.empty() ? ToJson(file, item, parent, maxRows)
                                           : Json{{"offset", item.box.offset}, {"fault", item.fault}});
    });
    return root;
}

}  // namespace clipfile
