// Not part of the interface: the text of the definitions and view files the
// library writes. One tab per level; attributes with an empty value are
// left out; values are written with XML's reserved characters encoded.
#pragma once

#include <string_view>

#include <ovracore/Strings.h>
#include <ovrametadata/Common.h>

namespace ovrametadata {

class XMLTextWriter {
 public:
  // Starts with the declaration line.
  XMLTextWriter() : mText("<?xml version=\"1.0\" encoding=\"UTF-8\" ?>\n") {}

  // Starts "<tag" at a level; attributes follow, then EndOpen or EndEmpty.
  void Open(int level, std::string_view tag) {
    Indent(level);
    mText += '<';
    mText += tag;
  }
  void Attribute(std::string_view name, std::string_view value) {
    if (value.empty()) return;
    mText += ' ';
    mText += name;
    mText += "=\"";
    mText += ovracore::EncodeXMLReserved(value);
    mText += '"';
  }
  void Attribute(std::string_view name, const UTF16String& value) { Attribute(name, ovracore::ToUTF8(value)); }
  void EndOpen() { mText += ">\n"; }
  void EndEmpty() { mText += " />\n"; }
  void Close(int level, std::string_view tag) {
    Indent(level);
    mText += "</";
    mText += tag;
    mText += ">\n";
  }
  void Line(int level, std::string_view text) {
    Indent(level);
    mText += text;
    mText += '\n';
  }
  const UTF8String& Text() const { return mText; }

 private:
  void Indent(int level) { mText.append(static_cast<std::size_t>(level < 0 ? 0 : level), '\t'); }
  UTF8String mText;
};

}  // namespace ovrametadata
