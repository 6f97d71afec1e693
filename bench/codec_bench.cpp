// codec_bench.cpp - the codec and the binding against other ways to read and write the same documents, in one
// run.
//
// For each size of document: bytes per second of CPU time (the best of the repetitions), what that is
// relative to the peers, and blocks and most memory taken for one document. ZUV_BENCH_HUGE=1 adds a document
// of 100 MB. Before measuring, all ways must agree on what the document says.
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include <benchmark/benchmark.h>
#include <expat.h>
#include <libxml/xmlreader.h>
#include <libxml/xmlwriter.h>
#include <pugixml.hpp>

#include "allocation_count.h"
#include "documents.h"
#include "engine_run.h"
#include "peer_report.h"
#include "peer_write.h"

namespace {

constexpr char ELEMENT[] = "protocolProblemReport:submitRequest";

// A document in all forms that are read or written.
struct document {
    std::string name;
    engine_run engine;
    const protocolProblemReport__ProblemReportContent *objects = nullptr; // owned by `owner`
    engine_run owner;
    std::string bytes;
    std::string head, tail; // what stands around the report
    peer::report structs;
    pugi::xml_document dom;
};

[[noreturn]] void refuse(const document &doc, const char *why)
{
    std::fprintf(stderr, "codec_bench: %s: %s\n", doc.name.c_str(), why);
    std::exit(1);
}

// ------------------------------------------------------------------------------------------ reading

void read_memcpy(document &doc)
{
    static std::vector<char> target;
    target.resize(doc.bytes.size());
    std::memcpy(target.data(), doc.bytes.data(), doc.bytes.size());
    benchmark::DoNotOptimize(target.data());
    benchmark::ClobberMemory();
}

void read_engine(document &doc)
{
    if (!doc.engine.read(doc.bytes))
        refuse(doc, "the engine can't read it");
    doc.engine.release();
}

void read_expat(document &doc)
{
    const XML_Parser parser = XML_ParserCreateNS(nullptr, '|');
    XML_SetElementHandler(
        parser, [](void *, const XML_Char *, const XML_Char **) {}, [](void *, const XML_Char *) {});
    XML_SetCharacterDataHandler(parser, [](void *, const XML_Char *, int) {});
    if (XML_Parse(parser, doc.bytes.data(), static_cast<int>(doc.bytes.size()), 1) != XML_STATUS_OK)
        refuse(doc, "expat can't read it");
    XML_ParserFree(parser);
}

void read_libxml2(document &doc)
{
    const xmlTextReaderPtr reader = xmlReaderForMemory(doc.bytes.data(), static_cast<int>(doc.bytes.size()),
                                                       nullptr, nullptr, XML_PARSE_HUGE | XML_PARSE_NONET);
    int result = 1;
    while (result == 1)
        result = xmlTextReaderRead(reader);
    if (result != 0)
        refuse(doc, "libxml2 can't read it");
    xmlFreeTextReader(reader);
}

void read_pugixml(document &doc)
{
    pugi::xml_document target;
    if (!target.load_buffer(doc.bytes.data(), doc.bytes.size()))
        refuse(doc, "pugixml can't read it");
}

void read_by_hand(document &doc)
{
    peer::report target;
    if (!peer::read(doc.bytes, target))
        refuse(doc, "the reader written by hand can't read it");
    benchmark::DoNotOptimize(&target);
}

// ------------------------------------------------------------------------------------------ writing

void write_engine(document &doc)
{
    if (doc.engine.write(doc.objects) != doc.bytes.size())
        refuse(doc, "the engine can't write it");
}

std::string append_all(const document &doc)
{
    std::string text(doc.head);
    peer::append_sink sink(text);
    peer::put(sink, ELEMENT, doc.structs);
    text += doc.tail;
    return text;
}

void write_append(document &doc)
{
    std::string text = append_all(doc);
    benchmark::DoNotOptimize(text.data());
}

struct libxml2_sink {
    xmlTextWriterPtr writer;
    static const xmlChar *of(std::string_view text) { return reinterpret_cast<const xmlChar *>(text.data()); }
    void start(std::string_view tag) { xmlTextWriterStartElement(writer, of(tag)); }
    void start_typed(std::string_view tag, std::string_view type)
    {
        start(tag);
        xmlTextWriterWriteAttribute(writer, of("xsi:type"), of(type));
    }
    void end(std::string_view) { xmlTextWriterEndElement(writer); }
    void element(std::string_view tag, std::string_view text)
    {
        xmlTextWriterWriteElement(writer, of(tag), of(text));
    }
};

void write_libxml2(document &doc)
{
    const xmlBufferPtr buffer = xmlBufferCreate();
    const xmlTextWriterPtr writer = xmlNewTextWriterMemory(buffer, 0);
    libxml2_sink sink{writer};
    xmlTextWriterWriteRaw(writer, libxml2_sink::of(doc.head));
    peer::put(sink, ELEMENT, doc.structs);
    xmlTextWriterWriteRaw(writer, libxml2_sink::of(doc.tail));
    xmlFreeTextWriter(writer);
    if (static_cast<std::size_t>(xmlBufferLength(buffer)) < doc.head.size() + doc.tail.size())
        refuse(doc, "libxml2 can't write it");
    xmlBufferFree(buffer);
}

struct string_target : pugi::xml_writer {
    std::string text;
    void write(const void *data, std::size_t size) override
    {
        text.append(static_cast<const char *>(data), size);
    }
};

void write_pugixml(document &doc)
{
    string_target target;
    doc.dom.save(target, "", pugi::format_raw);
    benchmark::DoNotOptimize(target.text.data());
}

// ------------------------------------------------------------------------------------------ the document

// All ways must read the same from it and write the same.
void check(document &doc)
{
    const auto *report = doc.engine.read(doc.bytes);
    if (!report || engine_run().written(report) != doc.bytes)
        refuse(doc, "read and written again by the engine it is another document");
    doc.engine.release();
    if (append_all(doc) != doc.bytes)
        refuse(doc, "read by hand and appended it is another document");
}

std::unique_ptr<document> make(const char *name, std::size_t size)
{
    auto doc = std::make_unique<document>();
    doc->name = name;
    doc->objects = make_document(&doc->owner, size);
    doc->bytes = doc->engine.written(doc->objects);
    const std::size_t begin = doc->bytes.find(std::string("<") + ELEMENT);
    const std::size_t end = doc->bytes.rfind("</SOAP-ENV:Body>");
    if (begin == std::string::npos || end == std::string::npos || !peer::read(doc->bytes, doc->structs) ||
        !doc->dom.load_buffer(doc->bytes.data(), doc->bytes.size()))
        refuse(*doc, "it can't be made");
    doc->head = doc->bytes.substr(0, begin);
    doc->tail = doc->bytes.substr(end);
    check(*doc);
    return doc;
}

// ------------------------------------------------------------------------------------------ measuring

struct way {
    const char *direction;
    const char *name;
    void (*run)(document &);
};

constexpr way ways[] = {
    {"read", "memcpy", read_memcpy},
    {"read", "engine", read_engine},
    {"read", "pugixml by hand", read_by_hand},
    {"read", "pugixml DOM", read_pugixml},
    {"read", "expat", read_expat},
    {"read", "libxml2 reader", read_libxml2},
    {"write", "engine", write_engine},
    {"write", "append loop", write_append},
    {"write", "pugixml save", write_pugixml},
    {"write", "libxml2 writer", write_libxml2},
};

void measure(benchmark::State &state, document &doc, const way &chosen)
{
    chosen.run(doc); // buffers that are kept from document to document are made here
    allocation_count_begin();
    chosen.run(doc);
    const allocation_count taken = allocation_count_end();
    for (auto _ : state)
        chosen.run(doc);
    state.SetBytesProcessed(static_cast<std::int64_t>(doc.bytes.size()) * state.iterations());
    state.counters["blocks"] = static_cast<double>(taken.blocks);
    state.counters["peak"] = static_cast<double>(taken.peak);
}

struct figures {
    double speed = 0; // bytes per second
    double blocks = 0, peak = 0;
};

// Gathers the best of each benchmark's repetitions.
class best_of : public benchmark::BenchmarkReporter {
public:
    std::map<std::string, figures> best;

    bool ReportContext(const Context &) override { return true; }
    void ReportRuns(const std::vector<Run> &runs) override
    {
        for (const Run &run : runs) {
            if (run.run_type != Run::RT_Iteration)
                continue;
            figures &place = best[run.run_name.function_name];
            place.speed = std::max(place.speed, static_cast<double>(run.counters.at("bytes_per_second")));
            place.blocks = run.counters.at("blocks");
            place.peak = run.counters.at("peak");
            std::fprintf(stderr, ".");
        }
    }
};

std::string key_of(const document &doc, const char *direction, const char *name)
{
    return doc.name + '/' + direction + '/' + name;
}

void print_table(const best_of &results, const std::vector<std::unique_ptr<document>> &documents)
{
    for (const auto &doc : documents) {
        std::printf("\n%s: %zu bytes\n%-24s %9s %9s %10s %10s %11s\n", doc->name.c_str(), doc->bytes.size(),
                    "", "MB/s", "blocks", "peak KB", "by hand=1", "expat=1");
        for (const way &shown : ways) {
            const auto found = results.best.find(key_of(*doc, shown.direction, shown.name));
            if (found == results.best.end())
                continue;
            const bool reads = std::strcmp(shown.direction, "read") == 0;
            const auto relative = [&](const char *name) {
                const auto peer = results.best.find(key_of(*doc, shown.direction, name));
                return peer == results.best.end() ? 0.0 : found->second.speed / peer->second.speed;
            };
            std::printf("%-6s%-18s %9.1f %9.0f %10.1f %10.2f", shown.direction, shown.name,
                        found->second.speed / 1e6, found->second.blocks, found->second.peak / 1024,
                        relative(reads ? "pugixml by hand" : "append loop"));
            if (reads)
                std::printf(" %11.2f", relative("expat"));
            std::printf("\n");
        }
    }
    std::printf("\nBytes per second of CPU time. \"by hand\": reading, structs bound by hand over pugixml's "
                "DOM; writing, "
                "the append loop.\n");
}

} // namespace

int main(int argc, char **argv)
{
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv))
        return 1;
    std::vector<std::unique_ptr<document>> documents;
    documents.push_back(make("2 KB", 2000));
    documents.push_back(make("100 KB", 100 * 1000));
    documents.push_back(make("10 MB", 10 * 1000 * 1000));
    const char *huge = std::getenv("ZUV_BENCH_HUGE");
    if (huge && std::strcmp(huge, "1") == 0)
        documents.push_back(make("100 MB", 100 * 1000 * 1000));
    for (const auto &doc : documents) {
        for (const way &chosen : ways)
            benchmark::RegisterBenchmark(key_of(*doc, chosen.direction, chosen.name).c_str(), measure,
                                         std::ref(*doc), std::cref(chosen));
    }
    best_of results;
    benchmark::RunSpecifiedBenchmarks(&results);
    print_table(results, documents);
    return 0;
}
