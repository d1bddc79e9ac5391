// JSON documents from text and as text.

#pragma once

#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>

#include <memory>
#include <stdexcept>
#include <string>

inline Json::Value parse(const std::string& text) {
  Json::Value document;
  const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
  if (!reader->parse(text.data(), text.data() + text.size(), &document, nullptr))
    throw std::invalid_argument(text);
  return document;
}

// On one line, members in the order of their names: [{"a":"1","b":"x"}]
inline std::string text(const Json::Value& document) {
  Json::StreamWriterBuilder writer;
  writer["indentation"] = "";
  writer["emitUTF8"] = true;
  return Json::writeString(writer, document);
}
