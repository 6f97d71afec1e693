// catalogue_text.cpp - the catalogue: two storage products, a database and a tool, with what updates them.
//
// Elsewhere: how it is read (catalogue.cpp), which declares the prefixes used here: u for update orders, p
// for what is common, r for problem reports.
#include "catalogue.h"

namespace service {

namespace {

// What the updates are for.
constexpr const char *DISK_ARRAY = R"(
<p:subject>
  <p:type>hardware</p:type>
  <p:productCollection>disk</p:productCollection>
  <p:productCollectionName>Disk storage</p:productCollectionName>
  <p:productCollectionMetaData><p:ocCode><p:ocCode>OC-1</p:ocCode><p:type>order</p:type></p:ocCode>
  </p:productCollectionMetaData>
  <p:product>ZX100</p:product>
  <p:productName>ZX100 disk array</p:productName>
  <p:productMetaData>
    <p:productClass>array</p:productClass>
    <p:ocCode><p:ocCode>OC-100</p:ocCode><p:type>order</p:type></p:ocCode>
    <p:attachableTo><p:product>SRV-1</p:product></p:attachableTo>
    <p:option>dual-controller</p:option>
    <p:nameDateTimePair><p:name>announced</p:name><p:dateTime>2020-03-01T00:00:00Z</p:dateTime></p:nameDateTimePair>
    <p:nameValuePair><p:name>colour</p:name><p:value>black</p:value></p:nameValuePair>
  </p:productMetaData>
  <p:version>1</p:version>
  <p:level>A</p:level>
  <p:platform>zx</p:platform>
  <p:platformName>ZX platform</p:platformName>
  <p:operatingPlatform>
    <p:displayName>ZX OS 4</p:displayName><p:name>zxos</p:name><p:version>4.2</p:version>
    <p:familyName>unix</p:familyName><p:hardwareName>arm</p:hardwareName><p:bitWidth>64</p:bitWidth>
  </p:operatingPlatform>
  <p:component>controller</p:component>
  <p:componentName>Array controller</p:componentName>
</p:subject>)";

constexpr const char *TAPE_LIBRARY = R"(
<p:subject>
  <p:type>hardware</p:type>
  <p:productCollection>tape</p:productCollection>
  <p:productCollectionName>Tape storage</p:productCollectionName>
  <p:product>ZX200</p:product>
  <p:productName>ZX200 tape library</p:productName>
  <p:version>2</p:version>
  <p:platform>zx</p:platform>
</p:subject>)";

constexpr const char *DATABASE = R"(
<p:subject>
  <p:type>software</p:type>
  <p:productCollection>database</p:productCollection>
  <p:productCollectionName>Databases</p:productCollectionName>
  <p:product>ZDB</p:product>
  <p:productName>Z database</p:productName>
  <p:version>10</p:version>
  <p:versionMetaData>
    <p:version>10</p:version>
    <p:restriction><p:type>export</p:type>
      <p:nameValuePair><p:name>region</p:name><p:value>eu</p:value></p:nameValuePair></p:restriction>
  </p:versionMetaData>
  <p:operatingPlatform>
    <p:displayName>Any system</p:displayName><p:name>any</p:name><p:bitWidth>32</p:bitWidth><p:bitWidth>64</p:bitWidth>
  </p:operatingPlatform>
  <p:component>engine</p:component>
</p:subject>)";

constexpr const char *TOOL = R"(
<p:subject>
  <p:type>software</p:type>
  <p:productCollection>tools</p:productCollection>
  <p:productCollectionName>Tools</p:productCollectionName>
  <p:product>ZTOOL</p:product>
  <p:productName>Z maintenance tool</p:productName>
  <p:version>3</p:version>
</p:subject>)";

struct update_row {
    const char *id, *name, *description, *status;
    const char *subject, *further_subject; // XML
    const char *rest;                      // XML of the members after the subjects
};

constexpr update_row UPDATES[] = {
    {"FW-100", "Array firmware 1.0", "First firmware of the disk array.", "superseded", DISK_ARRAY, "", R"(
<u:type>firmware</u:type><u:service>true</u:service><u:base>true</u:base>
<u:size>4096</u:size><u:version>1.0</u:version><u:level>A</u:level>
<u:languageDetail><p:language>en</p:language><p:languageName>English</p:languageName></u:languageDetail>
<u:category>recommended</u:category><u:releaseDateTime>2021-01-10T08:00:00Z</u:releaseDateTime>
<u:superseding><u:updateId>FW-110</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:superseding>)"},

    {"FW-110", "Array firmware 1.1", "Faster rebuild of arrays.", "superseded", DISK_ARRAY, "", R"(
<u:type>firmware</u:type><u:service>true</u:service><u:base>false</u:base>
<u:size>4196</u:size><u:version>1.1</u:version><u:level>B</u:level>
<u:languageDetail><p:language>en</p:language><p:languageName>English</p:languageName></u:languageDetail>
<u:category>recommended</u:category><u:releaseDateTime>2022-02-11T08:00:00Z</u:releaseDateTime>
<u:requisite xsi:type="u:Prerequisite"><u:updateId>BIOS-20</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier>
</u:requisite>
<u:superseded><u:updateId>FW-100</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:superseded>
<u:superseding><u:updateId>FW-120</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:superseding>)"},

    {"FW-120", "Array firmware 1.2", "Corrects a hang of the controller.", "available", DISK_ARRAY, "", R"(
<u:type>firmware</u:type><u:service>true</u:service><u:base>false</u:base>
<u:size>4296</u:size><u:version>1.2</u:version><u:level>C</u:level>
<u:languageDetail><p:language>en</p:language><p:languageName>English</p:languageName></u:languageDetail>
<u:languageDetail><p:language>de</p:language><p:languageName>Deutsch</p:languageName></u:languageDetail>
<u:category>critical</u:category><u:releaseDateTime>2023-03-12T08:00:00Z</u:releaseDateTime>
<u:requisite xsi:type="u:Prerequisite"><u:updateId>BIOS-20</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier>
</u:requisite>
<u:requisite xsi:type="u:Corequisite"><u:updateId>DRV-5</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier>
</u:requisite>
<u:superseded><u:updateId>FW-110</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:superseded>
<u:corrected><u:problemReport><r:title>Controller hangs under heavy load</r:title>
<r:problemDescription>The array stops answering and the controller must be restarted.</r:problemDescription>
</u:problemReport></u:corrected>)"},

    {"BIOS-20", "Controller start-up code 2.0", "", "superseded", DISK_ARRAY, "", R"(
<u:type>microcode</u:type><u:base>true</u:base><u:size>1024</u:size><u:version>2.0</u:version>
<u:category>recommended</u:category><u:releaseDateTime>2020-06-01T00:00:00Z</u:releaseDateTime>
<u:superseding><u:updateId>BIOS-30</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:superseding>)"},

    {"BIOS-30", "Controller start-up code 3.0", "", "available", DISK_ARRAY, "", R"(
<u:type>microcode</u:type><u:base>false</u:base><u:size>1124</u:size><u:version>3.0</u:version>
<u:category>security</u:category><u:releaseDateTime>2023-01-01T00:00:00Z</u:releaseDateTime>
<u:superseded><u:updateId>BIOS-20</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:superseded>)"},

    {"DRV-5", "Array driver 5", "", "available", DISK_ARRAY, "", R"(
<u:type>driver</u:type><u:base>true</u:base><u:size>512</u:size><u:version>5</u:version>
<u:category>recommended</u:category>
<u:attribute><u:name>reboot</u:name><u:value>required</u:value></u:attribute>
<u:releaseDateTime>2023-03-12T23:30:00Z</u:releaseDateTime>)"},

    {"DB-10", "Database 10.0", "The database itself.", "available", DATABASE, "", R"(
<u:type>software</u:type><u:base>true</u:base><u:license>Z database licence</u:license>
<u:restriction><p:type>licence</p:type><p:nameValuePair><p:name>seats</p:name><p:value>5</p:value></p:nameValuePair>
</u:restriction>
<u:size>9000</u:size><u:version>10.0</u:version>
<u:languageDetail><p:language>en</p:language><p:languageName>English</p:languageName></u:languageDetail>
<u:languageDetail><p:language>de</p:language><p:languageName>Deutsch</p:languageName></u:languageDetail>
<u:languageDetail><p:language>fr</p:language><p:languageName>Fran&#xE7;ais</p:languageName></u:languageDetail>
<u:hasReplacement>true</u:hasReplacement><u:category>optional</u:category>
<u:attribute><u:name>conditionalReplacement</u:name><u:value>DB-11</u:value></u:attribute>
<u:releaseDateTime>2022-09-01T12:00:00+02:00</u:releaseDateTime>)"},

    {"DB-10-P1", "Patch 1 for database 10.0", "", "available", DATABASE, "", R"(
<u:type>patch</u:type><u:size>300</u:size><u:version>10.0.1</u:version>
<u:category>critical</u:category><u:releaseDateTime>2022-11-05T10:00:00Z</u:releaseDateTime>
<u:patched><u:updateId>DB-10</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:patched>
<u:corrected><u:problemReport><r:title>Index is corrupt after restart</r:title>
<r:problemDescription>After a power failure the database refuses to open an index.</r:problemDescription>
</u:problemReport></u:corrected>)"},

    {"DB-11", "Database 11.0", "", "available", DATABASE, "", R"(
<u:type>software</u:type><u:base>true</u:base><u:size>9900</u:size><u:version>11.0</u:version>
<u:category>optional</u:category><u:releaseDateTime>2024-01-15T00:00:00Z</u:releaseDateTime>)"},

    {"TOOLS-1", "Maintenance tool", "", "available", TOOL, "", R"(
<u:type>software</u:type><u:ancillary>true</u:ancillary><u:size>700</u:size><u:version>3.1</u:version>
<u:category>optional</u:category><u:releaseDateTime>2021-05-05T00:00:00Z</u:releaseDateTime>)"},

    {"TAPE-7", "Tape library firmware 7", "", "pending", TAPE_LIBRARY, "", R"(
<u:type>firmware</u:type><u:base>true</u:base><u:implicitExclusion>true</u:implicitExclusion>
<u:restriction><p:type>approval</p:type></u:restriction><u:size>2048</u:size><u:version>7</u:version>
<u:category>optional</u:category><u:releaseDateTime>2024-06-30T00:00:00Z</u:releaseDateTime>)"},

    {"PACK-DB", "Database pack", "", "available", DATABASE, "", R"(
<u:type>group</u:type><u:size>0</u:size>
<u:category>pack</u:category><u:releaseDateTime>2023-06-01T00:00:00Z</u:releaseDateTime>
<u:contained><u:updateId>DB-10</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:contained>
<u:contained><u:updateId>DB-10-P1</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:contained>)"},

    {"PACK-2024", "Pack 2024", "", "available", DISK_ARRAY, DATABASE, R"(
<u:type>group</u:type><u:size>0</u:size>
<u:category>pack</u:category><u:releaseDateTime>2024-01-31T00:00:00Z</u:releaseDateTime>
<u:contained><u:updateId>FW-120</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:contained>
<u:contained><u:updateId>BIOS-30</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:contained>
<u:contained><u:updateId>PACK-DB</u:updateId><u:updateIdQualifier>ZUV</u:updateIdQualifier></u:contained>)"},
};

void put(std::string &xml, const char *member, const char *text)
{
    if (*text != '\0')
        xml.append("<u:").append(member).append(">").append(text).append("</u:").append(member).append(">");
}

} // namespace

std::string catalogue_text()
{
    std::string xml;
    for (const update_row &row : UPDATES) {
        xml.append("<u:updateMetaData>");
        put(xml, "updateId", row.id);
        put(xml, "updateIdQualifier", "ZUV");
        put(xml, "name", row.name);
        put(xml, "description", row.description);
        put(xml, "status", row.status);
        xml.append(row.subject).append(row.further_subject).append(row.rest).append("</u:updateMetaData>");
    }
    return xml;
}

} // namespace service
