// SPDX-License-Identifier: Apache-2.0
#include "benchmarks/json_peers.h"

#include <benchmark/benchmark.h>
#include <rapidjson/document.h>
#include <rapidjson/stringbuffer.h>
#include <rapidjson/writer.h>
#include <simdjson.h>

#include <boost/json.hpp>
#include <cstdlib>
#include <memory>
#include <nlohmann/json.hpp>
#include <stdexcept>
#include <utility>

#ifdef HAS_YYJSON
#include <yyjson.h>
#endif

#include "json/parser.h"
#include "json/serialize.h"
#include "json/value.h"

namespace benchmarks {
namespace {

using Action = std::function<void()>;

/// Checked once per parse, so that no peer is measured refusing its input.
void require(bool parsed) {
    if (!parsed)
        throw std::runtime_error("a peer refuses the input");
}

JsonPeer ours() {
    return {"ours",
            [](const std::string& text) -> Action {
                return [&text] {
                    const json::Object object = json::parse(text);
                    require(!object.empty());
                };
            },
            [](const std::string& text) -> Action {
                return [value = json::Value(json::parse(text))] {
                    benchmark::DoNotOptimize(json::serialize(value).data());
                };
            }};
}

/// The text has the padding that simdjson needs at its end, which a message has not.
JsonPeer simdjsonPeer() {
    return {"simdjson",
            [](const std::string& text) -> Action {
                return [padded = std::make_shared<simdjson::padded_string>(text)] {
                    simdjson::dom::parser parser;
                    require(parser.parse(*padded).error() == simdjson::SUCCESS);
                };
            },
            nullptr};
}

/// The same with one parser for all parses, which keeps its memory from one to the next.
JsonPeer simdjsonKeptPeer() {
    return {"simdjson, parser kept",
            [](const std::string& text) -> Action {
                return [padded = std::make_shared<simdjson::padded_string>(text),
                        parser = std::make_shared<simdjson::dom::parser>()] {
                    require(parser->parse(*padded).error() == simdjson::SUCCESS);
                };
            },
            nullptr};
}

#ifdef HAS_YYJSON
using YyjsonDocument = std::shared_ptr<yyjson_doc>;

YyjsonDocument yyjsonDocument(const std::string& text) {
    return {yyjson_read(text.data(), text.size(), 0), yyjson_doc_free};
}

JsonPeer yyjsonPeer() {
    return {"yyjson",
            [](const std::string& text) -> Action {
                return [&text] {
                    yyjson_doc* document = yyjson_read(text.data(), text.size(), 0);
                    require(document != nullptr);
                    yyjson_doc_free(document);
                };
            },
            [](const std::string& text) -> Action {
                return [document = yyjsonDocument(text)] {
                    std::size_t length = 0;
                    char* written = yyjson_write(document.get(), 0, &length);
                    benchmark::DoNotOptimize(written);
                    std::free(written);
                };
            }};
}
#endif

JsonPeer rapidjsonPeer() {
    return {"RapidJSON",
            [](const std::string& text) -> Action {
                return [&text] {
                    rapidjson::Document document;
                    document.Parse(text.data(), text.size());
                    require(!document.HasParseError());
                };
            },
            [](const std::string& text) -> Action {
                auto document = std::make_shared<rapidjson::Document>();
                document->Parse(text.data(), text.size());
                return [document = std::move(document)] {
                    rapidjson::StringBuffer buffer;
                    rapidjson::Writer<rapidjson::StringBuffer> writer(buffer);
                    document->Accept(writer);
                    benchmark::DoNotOptimize(buffer.GetString());
                };
            }};
}

JsonPeer boostPeer() {
    return {"Boost.JSON",
            [](const std::string& text) -> Action {
                return [&text] {
                    const boost::json::value value = boost::json::parse(text);
                    require(value.is_object());
                };
            },
            [](const std::string& text) -> Action {
                return [value = boost::json::parse(text)] {
                    benchmark::DoNotOptimize(boost::json::serialize(value).data());
                };
            }};
}

JsonPeer nlohmannPeer() {
    return {"nlohmann",
            [](const std::string& text) -> Action {
                return [&text] {
                    const nlohmann::json value = nlohmann::json::parse(text);
                    require(value.is_object());
                };
            },
            [](const std::string& text) -> Action {
                return [value = nlohmann::json::parse(text)] {
                    benchmark::DoNotOptimize(value.dump().data());
                };
            }};
}

}  // namespace

std::vector<JsonPeer> jsonPeers() {
    std::vector<JsonPeer> peers{ours(), simdjsonPeer(), simdjsonKeptPeer()};
#ifdef HAS_YYJSON
    peers.push_back(yyjsonPeer());
#endif
    peers.push_back(rapidjsonPeer());
    peers.push_back(boostPeer());
    peers.push_back(nlohmannPeer());
    return peers;
}

}  // namespace benchmarks
