// read_xsd.cpp - one XSD to declarations.
//
// The part of XSD that the contract uses, and no more:
//   schema       = import* (simpleType | complexType | element)*
//   simpleType   = restriction of facets, or of enumeration*
//   complexType  = sequence? attribute* anyAttribute? | complexContent extension | simpleContent extension
//   element      = reference, or a named type, or a type of its own
// Elsewhere: what the names refer to (build_model.cpp).
#include <algorithm>
#include <functional>

#include "reader.h"
#include "xml_file.h"

namespace {

constexpr std::string_view BINDING_SOURCE = "urn:zuv:binding"; // appinfo for this generator

class xsd_reader {
public:
    explicit xsd_reader(const xml_file &file) : xml(file) {}
    schema_declaration schema() const;

private:
    using handler = std::function<bool(std::string_view local, pugi::xml_node node)>;

    void each_child(pugi::xml_node parent, const handler &handle) const;
    void annotation(pugi::xml_node node, std::string &documentation, bool *by_value) const;
    simple_declaration simple_type(pugi::xml_node node) const;
    void restriction(pugi::xml_node node, simple_declaration &type) const;
    complex_declaration complex_type(pugi::xml_node node) const;
    void content(pugi::xml_node node, complex_declaration &type) const;
    void extension(pugi::xml_node node, complex_declaration &type) const;
    bool class_part(std::string_view local, pugi::xml_node node, complex_declaration &type) const;
    void sequence(pugi::xml_node node, complex_declaration &type) const;
    attribute_declaration attribute(pugi::xml_node node) const;
    void any_attribute(pugi::xml_node node) const;
    element_declaration element(pugi::xml_node node) const;
    element_declaration top_element(pugi::xml_node node) const;
    void occurrence(pugi::xml_node node, element_declaration &element) const;
    void one_type(pugi::xml_node node, const element_declaration &element) const;

    const xml_file &xml;
};

// Calls `handle` with each XSD child; what that does not accept can't be translated. Annotations that it does
// not accept are skipped.
void xsd_reader::each_child(pugi::xml_node parent, const handler &handle) const
{
    for (const pugi::xml_node child : parent.children()) {
        if (child.type() != pugi::node_element)
            xml.refuse(parent, std::string("text in ") + parent.name());
        const qualified_name name = xml.name_of(child);
        if (name.uri != XSD_URI || !(handle(name.local, child) || name.local == "annotation"))
            xml.refuse(child, std::string(child.name()) + " in " + parent.name() + " can't be translated");
    }
}

void xsd_reader::annotation(pugi::xml_node node, std::string &documentation, bool *by_value) const
{
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local == "documentation") {
            documentation += (documentation.empty() ? "" : " ") + plain_text(child.text().get());
            return true;
        }
        if (local != "appinfo")
            return false;
        if (BINDING_SOURCE == child.attribute("source").value()) {
            if (by_value == nullptr || plain_text(child.text().get()) != "value")
                xml.refuse(child, "unknown instruction in xsd:appinfo");
            *by_value = true;
        }
        return true;
    });
}

void xsd_reader::restriction(pugi::xml_node node, simple_declaration &type) const
{
    static constexpr std::string_view facets[] = {
        "length",       "minLength",    "maxLength",  "pattern",     "minInclusive",  "maxInclusive",
        "minExclusive", "maxExclusive", "whiteSpace", "totalDigits", "fractionDigits"};
    xml.allow_attributes(node, {"base"});
    type.base = xml.qualified(node, "base");
    bool faceted = false;
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local == "enumeration") {
            xml.allow_attributes(child, {"value"});
            literal_declaration literal{xml.at(child), xml.required(child, "value"), {}};
            each_child(child, [&](std::string_view inner, pugi::xml_node note) {
                if (inner == "annotation")
                    annotation(note, literal.documentation, nullptr);
                return false;
            });
            type.literals.push_back(std::move(literal));
            return true;
        }
        // A text is passed on unchanged; its facets are for those who set it to obey.
        faceted = faceted || local != "annotation";
        return std::find(std::begin(facets), std::end(facets), local) != std::end(facets);
    });
    if (faceted && !type.literals.empty())
        xml.refuse(node, "an enumeration with further facets can't be translated");
}

simple_declaration xsd_reader::simple_type(pugi::xml_node node) const
{
    xml.allow_attributes(node, {"name"});
    simple_declaration type;
    type.at = xml.at(node);
    type.name = node.attribute("name").value();
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local == "annotation")
            annotation(child, type.documentation, nullptr);
        if (local != "restriction")
            return false;
        restriction(child, type);
        return true;
    });
    if (type.base.local.empty())
        xml.refuse(node, "a simple type must be a restriction");
    return type;
}

attribute_declaration xsd_reader::attribute(pugi::xml_node node) const
{
    xml.allow_attributes(node, {"name", "type", "use"});
    attribute_declaration attribute;
    attribute.at = xml.at(node);
    attribute.name = xml.required(node, "name");
    attribute.type = xml.qualified(node, "type");
    const std::string_view use = node.attribute("use").as_string("optional");
    if (use != "required" && use != "optional")
        xml.refuse(node, "use \"" + std::string(use) + "\" can't be translated");
    attribute.required = use == "required";
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local == "annotation")
            annotation(child, attribute.documentation, nullptr);
        return false;
    });
    return attribute;
}

// The reader of every class skips attributes of other namespaces, so a wildcard for them needs no
// code.
void xsd_reader::any_attribute(pugi::xml_node node) const
{
    xml.allow_attributes(node, {"namespace", "processContents"});
    if (node.attribute("namespace").as_string() != std::string_view("##other"))
        xml.refuse(node, "attributes of the class's own namespace or of none must be declared: "
                         "xsd:anyAttribute is for namespace=\"##other\"");
}

// minOccurs and maxOccurs: at most once, or without an upper bound.
void xsd_reader::occurrence(pugi::xml_node node, element_declaration &element) const
{
    const std::string least = node.attribute("minOccurs").as_string("1");
    const std::string most = node.attribute("maxOccurs").as_string("1");
    if (most != "1" && most != "unbounded")
        xml.refuse(node, "maxOccurs \"" + most + "\" can't be translated: only 1 and unbounded");
    element.unbounded = most == "unbounded";
    if (least.empty() || least.size() > 3 || least.find_first_not_of("0123456789") != std::string::npos)
        xml.refuse(node, "minOccurs \"" + least + "\" can't be translated");
    element.minimum = static_cast<unsigned>(std::stoul(least));
    if (element.minimum > (element.unbounded ? 255U : 1U))
        xml.refuse(node, "minOccurs \"" + least + "\" can't be translated: " +
                             (element.unbounded ? "at most 255" : "more than maxOccurs"));
}

void xsd_reader::one_type(pugi::xml_node node, const element_declaration &element) const
{
    const int forms = (element.type ? 1 : 0) + (element.simple ? 1 : 0) + (element.complex ? 1 : 0);
    if (forms == 0)
        xml.refuse(node, "element \"" + element.name + "\" has no type");
    if (forms > 1)
        xml.refuse(node, "element \"" + element.name + "\" has two types");
}

element_declaration xsd_reader::element(pugi::xml_node node) const
{
    element_declaration element;
    element.at = xml.at(node);
    if (node.attribute("ref")) {
        xml.allow_attributes(node, {"ref", "minOccurs", "maxOccurs"});
        element.reference = xml.qualified(node, "ref");
    } else {
        xml.allow_attributes(node, {"name", "type", "minOccurs", "maxOccurs", "nillable", "default"});
        element.name = xml.required(node, "name");
        if (node.attribute("type"))
            element.type = xml.qualified(node, "type");
        if (const pugi::xml_attribute initial = node.attribute("default"))
            element.initial = initial.value();
    }
    occurrence(node, element);
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local == "annotation")
            annotation(child, element.documentation, &element.by_value);
        if (element.reference)
            return false;
        if (local == "simpleType" && !element.simple)
            element.simple = std::make_shared<simple_declaration>(simple_type(child));
        else if (local == "complexType" && !element.complex)
            element.complex = std::make_shared<complex_declaration>(complex_type(child));
        else
            return false;
        return true;
    });
    if (!element.reference)
        one_type(node, element);
    return element;
}

void xsd_reader::sequence(pugi::xml_node node, complex_declaration &type) const
{
    xml.allow_attributes(node, {});
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local != "element")
            return false;
        type.elements.push_back(element(child));
        return true;
    });
}

bool xsd_reader::class_part(std::string_view local, pugi::xml_node node, complex_declaration &type) const
{
    if (local == "sequence" && type.elements.empty())
        sequence(node, type);
    else if (local == "attribute")
        type.attributes.push_back(attribute(node));
    else if (local == "anyAttribute")
        any_attribute(node);
    else
        return false;
    return true;
}

void xsd_reader::extension(pugi::xml_node node, complex_declaration &type) const
{
    xml.allow_attributes(node, {"base"});
    type.base = xml.qualified(node, "base");
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        return !(type.simple_content && local == "sequence") && class_part(local, child, type);
    });
}

void xsd_reader::content(pugi::xml_node node, complex_declaration &type) const
{
    xml.allow_attributes(node, {});
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local != "extension" || type.base)
            return false;
        extension(child, type);
        return true;
    });
    if (!type.base)
        xml.refuse(node, std::string(node.name()) + " extends nothing");
}

complex_declaration xsd_reader::complex_type(pugi::xml_node node) const
{
    xml.allow_attributes(node, {"name"});
    complex_declaration type;
    type.at = xml.at(node);
    type.name = node.attribute("name").value();
    each_child(node, [&](std::string_view local, pugi::xml_node child) {
        if (local == "annotation") {
            annotation(child, type.documentation, nullptr);
            return true;
        }
        if ((local == "complexContent" || local == "simpleContent") && !type.base) {
            type.simple_content = local == "simpleContent";
            content(child, type);
            return true;
        }
        return !type.base && class_part(local, child, type);
    });
    return type;
}

element_declaration xsd_reader::top_element(pugi::xml_node node) const
{
    xml.allow_attributes(node, {"name", "type", "nillable"});
    return element(node);
}

schema_declaration xsd_reader::schema() const
{
    const pugi::xml_node root = xml.root();
    if (!xml.is(root, XSD_URI, "schema"))
        xml.refuse(root, "not an XML schema");
    xml.allow_attributes(root, {"targetNamespace", "elementFormDefault", "attributeFormDefault", "version"});
    if (root.attribute("elementFormDefault").as_string() != std::string_view("qualified"))
        xml.refuse(root, "elements must be qualified (elementFormDefault)");
    if (root.attribute("attributeFormDefault").as_string("unqualified") != std::string_view("unqualified"))
        xml.refuse(root, "attributes must be unqualified (attributeFormDefault)");

    schema_declaration schema;
    schema.file = xml.file();
    schema.at = xml.at(root);
    schema.uri = xml.required(root, "targetNamespace");
    each_child(root, [&](std::string_view local, pugi::xml_node child) {
        if (local == "annotation") {
            annotation(child, schema.documentation, nullptr);
        } else if (local == "simpleType") {
            xml.required(child, "name");
            schema.simple_types.push_back(simple_type(child));
        } else if (local == "complexType") {
            xml.required(child, "name");
            schema.complex_types.push_back(complex_type(child));
        } else if (local == "element") {
            schema.elements.push_back(top_element(child));
        } else {
            // Every file of the directory is read, so an import has nothing to add.
            return local == "import";
        }
        return true;
    });
    return schema;
}

} // namespace

schema_declaration read_schema(const std::filesystem::path &path, const std::string &name)
{
    const xml_file xml(path, name);
    return xsd_reader(xml).schema();
}
