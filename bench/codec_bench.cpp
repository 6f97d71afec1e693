// codec_bench.cpp - the codec and the binding against other ways to read and write the same documents, in one
// run.
//
// For each document: bytes per second of CPU time (the best of the repetitions), what that is relative to the
// peers, and blocks and most memory taken for one document. ZUV_BENCH_HUGE=1 adds a document of 100 MB. Before
// measuring, all ways must agree on what the document says. Reading the largest documents is bounded by memory and
// by what was done with it before, so that is measured in processes of its own, too.
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include <sys/mman.h>
#include <time.h>
#include <unistd.h>

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
#include "sample_profile.h"
#include "traits_protocolProblemReport.h"

namespace {

constexpr std::size_t ALONE_BYTES = 5 * 1000 * 1000; // from which reading is measured in processes of its own
constexpr int PROCESSES = 5;                         // of each way; the best counts
constexpr std::size_t LATER_READS = 9;
constexpr std::size_t POOL_FACTOR = 64; // a large pool_limit, in sizes of the document
constexpr const char *ENGINE = "engine", *LARGE_POOL = "engine, large pool", *BY_HAND = "pugixml by hand";

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

// A document's content in plain structs, and what a host by hand does with them.
struct peer_content {
    virtual ~peer_content() = default;
    virtual bool read(const std::string &bytes) = 0; // keeps what it read
    virtual void drop() = 0;
    virtual bool read_and_drop(const std::string &bytes) const = 0;
    virtual void put(peer::append_sink sink, const char *element) const = 0;
    virtual void put(libxml2_sink sink, const char *element) const = 0;
};

template <class Content> struct peer_content_of final : peer_content {
    Content kept;
    bool read(const std::string &bytes) override { return peer::read(bytes, kept = {}); }
    void drop() override { kept = {}; }
    bool read_and_drop(const std::string &bytes) const override
    {
        Content target;
        const bool done = peer::read(bytes, target);
        benchmark::DoNotOptimize(&target);
        return done;
    }
    void put(peer::append_sink sink, const char *element) const override { peer::put(sink, element, kept); }
    void put(libxml2_sink sink, const char *element) const override { peer::put(sink, element, kept); }
};

// What a message holds.
struct content_kind {
    const char *name;
    const char *element;
    const binding::class_ops &ops;
    std::unique_ptr<peer_content> (*make_peer)();
};

template <class Content> std::unique_ptr<peer_content> make_peer()
{
    return std::make_unique<peer_content_of<Content>>();
}

const content_kind REPORTS = {"reports", "protocolProblemReport:submitRequest",
                              binding::traits<protocolProblemReport__ProblemReportContent>::ops,
                              make_peer<peer::report>};
const content_kind PROFILES = {"profiles", PROFILE_ELEMENT, profile_ops(), make_peer<peer::profile>};

// A document in all forms that are read or written.
struct document {
    document(const content_kind &what, std::string called)
        : kind(what), name(std::move(called)), engine(what.ops, what.element), pooled(what.ops, what.element),
          structs(what.make_peer())
    {}

    const content_kind &kind;
    std::string name;
    engine_run engine;             // with default settings
    engine_run pooled;             // keeps all that is released for the next document
    const void *objects = nullptr; // null: in a form that the engine reads, and never writes
    std::string bytes;
    std::string head, tail; // what encloses the content
    std::unique_ptr<peer_content> structs;
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

void read_pooled(document &doc)
{
    if (!doc.pooled.read(doc.bytes))
        refuse(doc, "the engine can't read it");
    doc.pooled.release();
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
    if (!doc.structs->read_and_drop(doc.bytes))
        refuse(doc, "the reader written by hand can't read it");
}

// ------------------------------------------------------------------------------------------ writing

void write_engine(document &doc)
{
    if (doc.engine.write(doc.objects) != doc.bytes.size())
        refuse(doc, "the engine can't write it");
}

void write_stored(document &doc)
{
    if (doc.engine.write(doc.objects, MODE_STORE) <= doc.bytes.size())
        refuse(doc, "the engine can't write it");
}

void write_chunked(document &doc)
{
    if (doc.engine.write(doc.objects, MODE_CHUNKED) <= doc.bytes.size())
        refuse(doc, "the engine can't write it");
}

std::string append_all(const document &doc)
{
    std::string text(doc.head);
    doc.structs->put(peer::append_sink(text), doc.kind.element);
    text += doc.tail;
    return text;
}

void write_append(document &doc)
{
    std::string text = append_all(doc);
    benchmark::DoNotOptimize(text.data());
}

void write_libxml2(document &doc)
{
    const xmlBufferPtr buffer = xmlBufferCreate();
    const xmlTextWriterPtr writer = xmlNewTextWriterMemory(buffer, 0);
    xmlTextWriterWriteRaw(writer, libxml2_sink::of(doc.head));
    doc.structs->put(libxml2_sink{writer}, doc.kind.element);
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
void check(document &doc, const std::string &canonical)
{
    const void *read = doc.engine.read(doc.bytes);
    if (!read || engine_run(doc.kind.ops, doc.kind.element).written(read) != canonical)
        refuse(doc, "read and written again by the engine it is another document");
    doc.engine.release();
    if (doc.objects && append_all(doc) != doc.bytes)
        refuse(doc, "read by hand and appended it is another document");
}

std::unique_ptr<document> make(const content_kind &kind, const char *name, const void *objects)
{
    auto doc = std::make_unique<document>(kind, name);
    doc->objects = objects;
    doc->bytes = doc->engine.written(objects);
    doc->pooled.pool_limit = POOL_FACTOR * doc->bytes.size();
    const std::size_t begin = doc->bytes.find(std::string("<") + kind.element);
    const std::size_t end = doc->bytes.rfind("</SOAP-ENV:Body>");
    if (begin == std::string::npos || end == std::string::npos || !doc->structs->read(doc->bytes) ||
        !doc->dom.load_buffer(doc->bytes.data(), doc->bytes.size()))
        refuse(*doc, "it can't be made");
    doc->head = doc->bytes.substr(0, begin);
    doc->tail = doc->bytes.substr(end);
    check(*doc, doc->bytes);
    return doc;
}

// The document with the same content in other bytes, to be read only.
std::unique_ptr<document> in_other_bytes(const document &doc, const char *name, std::string bytes)
{
    auto made = std::make_unique<document>(doc.kind, name);
    made->bytes = std::move(bytes);
    made->pooled.pool_limit = doc.pooled.pool_limit;
    check(*made, doc.bytes);
    return made;
}

// ------------------------------------------------------------------------------------------ measuring

struct way {
    const char *direction;
    const char *name;
    void (*run)(document &);
};

constexpr way ways[] = {
    {"read", "memcpy", read_memcpy},
    {"read", ENGINE, read_engine},
    {"read", LARGE_POOL, read_pooled},
    {"read", BY_HAND, read_by_hand},
    {"read", "pugixml DOM", read_pugixml},
    {"read", "expat", read_expat},
    {"read", "libxml2 reader", read_libxml2},
    {"write", "engine, counted", write_engine},
    {"write", "engine, stored", write_stored},
    {"write", "engine, chunked", write_chunked},
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
                        relative(reads ? BY_HAND : "append loop"));
            if (reads)
                std::printf(" %11.2f", relative("expat"));
            std::printf("\n");
        }
    }
    std::printf("\nBytes per second of CPU time. \"by hand\": reading, structs bound by hand over pugixml's "
                "DOM; writing, "
                "the append loop.\n");
}

// ------------------------------------------------------------------------------------------ processes

// Reading in a process that does nothing else, as a host's: what other ways leave of the heap has no part in it.

double cpu_seconds()
{
    timespec now{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

// In a process of its own: reads the document at standard input, at first without releasing what was read. Prints
// the seconds of the first reading and the median of the later ones, which release it.
int run_alone(const std::string &kind_name, const std::string &way_name)
{
    document doc(kind_name == REPORTS.name ? REPORTS : PROFILES, kind_name);
    char buffer[65536];
    for (std::size_t got = 0; (got = std::fread(buffer, 1, sizeof buffer, stdin)) > 0;)
        doc.bytes.append(buffer, got);
    const bool by_hand = way_name == BY_HAND;
    if (way_name == LARGE_POOL)
        doc.engine.pool_limit = POOL_FACTOR * doc.bytes.size();
    const double began = cpu_seconds();
    if (!(by_hand ? doc.structs->read(doc.bytes) : doc.engine.read(doc.bytes) != nullptr))
        refuse(doc, "it can't be read");
    const double first = cpu_seconds() - began;
    by_hand ? doc.structs->drop() : doc.engine.release();
    std::vector<double> later(LATER_READS);
    for (double &seconds : later) {
        const double start = cpu_seconds();
        by_hand ? read_by_hand(doc) : read_engine(doc);
        seconds = cpu_seconds() - start;
    }
    std::nth_element(later.begin(), later.begin() + LATER_READS / 2, later.end());
    std::printf("%.9f %.9f\n", first, later[LATER_READS / 2]);
    return 0;
}

struct alone_speed {
    double first = 0, later = 0; // bytes per second
};

// The best of some processes.
alone_speed speed_alone(const document &doc, const char *way_name)
{
    const int file = memfd_create("document", 0);
    for (std::size_t done = 0; done < doc.bytes.size();) {
        const ssize_t count = ::write(file, doc.bytes.data() + done, doc.bytes.size() - done);
        if (count <= 0)
            refuse(doc, "no memory file can be written");
        done += static_cast<std::size_t>(count);
    }
    const std::string self = "/proc/" + std::to_string(getpid());
    const std::string command = self + "/exe --alone " + doc.kind.name + " '" + way_name + "' < " + self +
                                "/fd/" + std::to_string(file);
    const auto bytes = static_cast<double>(doc.bytes.size());
    alone_speed best;
    for (int i = 0; i < PROCESSES; ++i) {
        std::FILE *const output = popen(command.c_str(), "r");
        double first = 0, later = 0;
        const bool read = output && std::fscanf(output, "%lf %lf", &first, &later) == 2;
        if (!output || pclose(output) != 0 || !read)
            refuse(doc, "its reading in a process of its own failed");
        best = {std::max(best.first, bytes / first), std::max(best.later, bytes / later)};
    }
    close(file);
    return best;
}

void print_alone(const std::vector<std::unique_ptr<document>> &documents)
{
    std::printf("\n%-32s %12s %10s %12s %10s\n", "read in a process of its own", "first, MB/s", "by hand=1",
                "later, MB/s", "by hand=1");
    for (const auto &doc : documents) {
        if (doc->bytes.size() < ALONE_BYTES)
            continue;
        const alone_speed by_hand = speed_alone(*doc, BY_HAND);
        std::printf("%s\n", doc->name.c_str());
        for (const char *const name : {ENGINE, LARGE_POOL, BY_HAND}) {
            const alone_speed found = name == BY_HAND ? by_hand : speed_alone(*doc, name);
            std::printf("  %-30s %12.1f %10.2f %12.1f %10.2f\n", name, found.first / 1e6,
                        found.first / by_hand.first, found.later / 1e6, found.later / by_hand.later);
        }
    }
}

} // namespace

int main(int argc, char **argv)
{
    if (argc == 4 && std::strcmp(argv[1], "--alone") == 0)
        return run_alone(argv[2], argv[3]);
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv))
        return 1;
    engine_run owner(REPORTS.ops, REPORTS.element); // of the problem reports
    const bool huge = std::getenv("ZUV_BENCH_HUGE") && std::strcmp(std::getenv("ZUV_BENCH_HUGE"), "1") == 0;
    sample_profile small, middle(380), large(38000);
    profile_answer(small); // brings it to its size
    std::vector<std::unique_ptr<document>> documents;
    documents.push_back(make(REPORTS, "problem report, 2 KB", make_document(&owner, 2000)));
    documents.push_back(make(REPORTS, "problem reports, 100 KB", make_document(&owner, 100 * 1000)));
    documents.push_back(make(REPORTS, "problem reports, 10 MB", make_document(&owner, 10 * 1000 * 1000)));
    documents.push_back(make(PROFILES, "profile, 2 KB", &small.profile));
    documents.push_back(
        in_other_bytes(*documents.back(), "profile, 2 KB, 15 namespaces", profile_answer(small)));
    documents.push_back(make(PROFILES, "profile, 100 KB", &middle.profile));
    documents.push_back(in_other_bytes(*documents.back(), "profile, 100 KB, default namespaces",
                                       in_default_namespaces(documents.back()->bytes)));
    documents.push_back(make(PROFILES, "profile, 10 MB", &large.profile));
    if (huge)
        documents.push_back(
            make(REPORTS, "problem reports, 100 MB", make_document(&owner, 100 * 1000 * 1000)));
    for (const auto &doc : documents) {
        for (const way &chosen : ways) {
            if (doc->objects || std::strcmp(chosen.direction, "read") == 0)
                benchmark::RegisterBenchmark(key_of(*doc, chosen.direction, chosen.name).c_str(), measure,
                                             std::ref(*doc), std::cref(chosen));
        }
    }
    best_of results;
    benchmark::RunSpecifiedBenchmarks(&results);
    print_table(results, documents);
    print_alone(documents);
    return 0;
}
