// How fast property lists are read and written, beside a general XML parser that builds the same values.
//
//  bench-propertylist [Google Benchmark's options]
//  bench-propertylist --write-document=FILE    writes the document that the others read, and ends

#include "propertylist/Base64.h"
#include "propertylist/CalendarDate.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "propertylist/RealText.h"

#include <benchmark/benchmark.h>
#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <pugixml.hpp>
#include <random>

namespace welcomer {
namespace {

constexpr std::size_t kDocumentSize = 10'000'000;

std::string makeText(std::mt19937& random, std::size_t longest) {
    constexpr std::string_view characters =
        "abcdefghijklmnopqrstuvwxyz ABCDEFGHIJKLMNOPQRSTUVWXYZ 0123456789 -._";
    std::string text(1 + random() % longest, ' ');
    for (char& character : text) {
        character = characters[random() % characters.size()];
    }
    return text;
}

// One entry of the kind that preferences and cached responses are made of.
PropertyList makeRecord(std::mt19937& random) {
    std::string blob(random() % 400, '\0');
    for (char& byte : blob) {
        byte = static_cast<char>(random());
    }
    PropertyList::Array aliases;
    for (std::size_t count = random() % 5; count > 0; --count) {
        aliases.emplace_back("mailto:" + makeText(random, 12) + "@example.invalid");
    }
    std::string note = makeText(random, 80);
    if (random() % 4 == 0) {
        note += " <& \xE2\x82\xAC>";
    }
    return PropertyList::Dictionary{
        {"account", makeText(random, 24)},
        {"aliases", std::move(aliases)},
        {"created", PropertyList::Date{static_cast<double>(random() % 2'000'000'000)}},
        {"enabled", random() % 2 == 0},
        {"identifier", static_cast<std::uint64_t>(random()) << 20 | random()},
        {"note", std::move(note)},
        {"profile", PropertyList::Dictionary{{"first-name", makeText(random, 10)},
                                             {"last-name", makeText(random, 14)},
                                             {"quota", static_cast<std::int64_t>(random() % 100'000)},
                                             {"used", std::generate_canonical<double, 53>(random)}}},
        {"token", PropertyList::Data{std::move(blob)}},
    };
}

PropertyList makeValue(std::size_t records) {
    std::mt19937 random(20010203);
    PropertyList::Array array;
    for (std::size_t record = 0; record < records; ++record) {
        array.push_back(makeRecord(random));
    }
    return PropertyList::Dictionary{{"records", std::move(array)}, {"version", 1}};
}

// About kDocumentSize bytes, the same in every run.
const std::string& document() {
    static const std::string text = [] {
        constexpr std::size_t sample = 1000;
        const std::size_t sampleSize = writeXMLPropertyList(makeValue(sample)).value().size();
        return writeXMLPropertyList(makeValue(kDocumentSize * sample / sampleSize)).value();
    }();
    return text;
}

// ---- The peer

PropertyList valueOf(const pugi::xml_node& node) {
    const std::string_view name = node.name();
    const std::string_view text = node.child_value();
    if (name == "dict") {
        PropertyList::Dictionary dictionary;
        for (pugi::xml_node key = node.first_child(); key; key = key.next_sibling()) {
            const pugi::xml_node value = key.next_sibling();
            dictionary.insert_or_assign(dictionary.end(), std::string(key.child_value()), valueOf(value));
            key = value;
        }
        return PropertyList(std::move(dictionary));
    }
    if (name == "array") {
        PropertyList::Array array;
        for (const pugi::xml_node& value : node) {
            array.push_back(valueOf(value));
        }
        return PropertyList(std::move(array));
    }
    if (name == "string") {
        return text;
    }
    if (name == "integer") {
        if (text.starts_with('-')) {
            std::int64_t value = 0;
            std::from_chars(text.data(), text.data() + text.size(), value);
            return value;
        }
        std::uint64_t value = 0;
        std::from_chars(text.data(), text.data() + text.size(), value);
        return value;
    }
    if (name == "real") {
        return parseReal(text).value();
    }
    if (name == "true" || name == "false") {
        return name == "true";
    }
    if (name == "date") {
        return parseCalendarDate(text).value();
    }
    PropertyList::Data data;
    decodeBase64(text, data.bytes);
    return PropertyList(std::move(data));
}

PropertyList readWithPugixml(const std::string& text) {
    pugi::xml_document parsed;
    // A string may be white space alone.
    constexpr unsigned options = pugi::parse_default | pugi::parse_ws_pcdata_single;
    if (!parsed.load_buffer(text.data(), text.size(), options, pugi::encoding_utf8)) {
        std::abort();
    }
    return valueOf(parsed.child("plist").first_child());
}

// ---- Cases

void countBytes(benchmark::State& state, std::size_t size) {
    state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(size));
}

void BM_ReadXML_Welcomer(benchmark::State& state) {
    for (auto _ : state) {
        benchmark::DoNotOptimize(readPropertyList(document()));
    }
    countBytes(state, document().size());
}
BENCHMARK(BM_ReadXML_Welcomer)->Unit(benchmark::kMillisecond);

void BM_ReadXML_Pugixml(benchmark::State& state) {
    if (readWithPugixml(document()) != readPropertyList(document()).value) {
        state.SkipWithError("the two readers differ");
    }
    for (auto _ : state) {
        benchmark::DoNotOptimize(readWithPugixml(document()));
    }
    countBytes(state, document().size());
}
BENCHMARK(BM_ReadXML_Pugixml)->Unit(benchmark::kMillisecond);

void BM_WriteXML_Welcomer(benchmark::State& state) {
    const PropertyList value = readPropertyList(document()).value.value();
    for (auto _ : state) {
        benchmark::DoNotOptimize(writeXMLPropertyList(value));
    }
    countBytes(state, document().size());
}
BENCHMARK(BM_WriteXML_Welcomer)->Unit(benchmark::kMillisecond);

// A single data element of so many bytes, as replay data has them.
void BM_ReadXMLData_Welcomer(benchmark::State& state) {
    const std::string content(static_cast<std::size_t>(state.range(0)), 'x');
    const std::string text = writeXMLPropertyList(PropertyList(PropertyList::Data{content})).value();
    for (auto _ : state) {
        benchmark::DoNotOptimize(readPropertyList(text));
    }
    countBytes(state, text.size());
}
BENCHMARK(BM_ReadXMLData_Welcomer)
    ->RangeMultiplier(10)
    ->Range(1'000, 100'000'000)
    ->Unit(benchmark::kMicrosecond);

void BM_WriteXMLData_Welcomer(benchmark::State& state) {
    const PropertyList value(PropertyList::Data{std::string(static_cast<std::size_t>(state.range(0)), 'x')});
    for (auto _ : state) {
        benchmark::DoNotOptimize(writeXMLPropertyList(value));
    }
    countBytes(state, static_cast<std::size_t>(state.range(0)));
}
BENCHMARK(BM_WriteXMLData_Welcomer)
    ->RangeMultiplier(10)
    ->Range(1'000, 100'000'000)
    ->Unit(benchmark::kMicrosecond);

} // namespace
} // namespace welcomer

int main(int argc, char** argv) {
    constexpr std::string_view writeOption = "--write-document=";
    if (argc == 2 && std::string_view(argv[1]).starts_with(writeOption)) {
        std::ofstream file(argv[1] + writeOption.size(), std::ios::binary);
        file << welcomer::document() << std::flush;
        return file ? EXIT_SUCCESS : EXIT_FAILURE;
    }
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) {
        return EXIT_FAILURE;
    }
    benchmark::RunSpecifiedBenchmarks();
    benchmark::Shutdown();
    return EXIT_SUCCESS;
}
