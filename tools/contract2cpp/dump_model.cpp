// dump_model.cpp - the model as text, for the reader and for the tests of the first two stages.
#include <ostream>

#include "model.h"

namespace {

std::string how(const class_member &member)
{
    switch (member.how) {
    case occurs::optional:
        return "optional";
    case occurs::required:
        return "required";
    case occurs::value:
        return "value";
    case occurs::always:
        return "always";
    case occurs::many:
        break;
    }
    return member.minimum ? "many(" + std::to_string(member.minimum) + ")" : "many";
}

void dump_enumeration(const enumeration &type, std::ostream &out)
{
    out << "  enumeration " << type.xml_type << " " << type.name << " " << type.type_id << "\n";
    for (const literal &literal : type.literals)
        out << "    \"" << literal.text << "\" " << literal.name << "\n";
}

void dump_class(const data_class &type, std::ostream &out)
{
    out << "  class " << type.xml_type << " " << type.name << " " << type.type_id;
    out << (type.base.empty() ? "" : " base " + type.base) << (type.top_level ? " top-level" : "")
        << (type.simple_content ? " text" : "") << "\n";
    for (const class_attribute &attribute : type.attributes)
        out << "    attribute " << attribute.xml_name << " " << attribute.type << " " << attribute.name
            << (attribute.required ? " required" : "") << "\n";
    for (const class_member &member : type.members) {
        out << "    " << how(member) << " " << member.tag << " " << member.type << " " << member.name << " "
            << member.item_id;
        out << (member.vector_id.empty() ? "" : " " + member.vector_id)
            << (member.initial.empty() ? "" : " = " + member.initial) << "\n";
    }
}

void dump_port(const port &port, std::ostream &out)
{
    out << "port " << port.name << " " << port.binding << " " << port.address << (port.proxy ? " proxy" : "")
        << "\n";
    for (const operation &operation : port.operations) {
        out << "  operation " << operation.name << "\n";
        for (const message_record *record : {&operation.request, &operation.response})
            out << "    " << record->name << " " << record->type_id << " " << record->element << " "
                << record->object << "\n";
    }
}

} // namespace

void dump_model(const contract_model &model, std::ostream &out)
{
    for (const service_namespace &service : model.services) {
        out << "namespace " << service.prefix << " " << service.file << "\n";
        for (const enumeration &type : service.enumerations)
            dump_enumeration(type, out);
        for (const data_class &type : service.classes)
            dump_class(type, out);
    }
    for (const port &port : model.ports)
        dump_port(port, out);
    for (const identified_type &type : model.types)
        out << "type " << type.id << " " << type.constant << " " << type.xml_name
            << (type.item.empty() ? "" : " of " + type.item) << "\n";
}
