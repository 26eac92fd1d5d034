// Helpers for the test programs that link the metadata library.
#pragma once

#include <sstream>
#include <string>
#include <vector>

#include <boost/make_shared.hpp>
#include <boost/optional/optional_io.hpp>
#include <gtest/gtest.h>

#include <ovracore/Strings.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Paths.h>

namespace ovratest {

inline std::string U8(const std::u16string& text) { return ovracore::ToUTF8(text); }
inline std::u16string U16(const std::string& text) { return ovracore::ToUTF16(text); }

// The errors reported after construction (the list is process-wide and
// only the last Terminate empties it).
class ErrorsSince {
 public:
  ErrorsSince() : mStart(ovrametadata::GetErrorInfos().size()) {}
  std::vector<ovrametadata::ErrorInfo> New() const {
    std::vector<ovrametadata::ErrorInfo> all = ovrametadata::GetErrorInfos();
    if (all.size() < mStart) return all;  // a Terminate emptied the list meanwhile
    return std::vector<ovrametadata::ErrorInfo>(all.begin() + static_cast<std::ptrdiff_t>(mStart),
                                                all.end());
  }
  std::vector<std::string> Texts() const {
    std::vector<std::string> texts;
    for (const auto& info : New()) texts.push_back(U8(info.message));
    return texts;
  }
  void ExpectNone() const { EXPECT_EQ(Texts(), std::vector<std::string>()); }
  // Exactly these reports came, in this order, each of `type` from `source`.
  void Expect(ovrametadata::ErrorType type, const std::u16string& source,
              const std::vector<std::string>& texts) const {
    EXPECT_EQ(Texts(), texts);
    for (const auto& info : New()) {
      EXPECT_EQ(info.type, type) << U8(info.message);
      EXPECT_EQ(U8(info.source), U8(source)) << U8(info.message);
    }
  }

 private:
  std::size_t mStart;
};

// Keeps the library initialised for the lifetime of the object.
class LibraryScope {
 public:
  LibraryScope() { ovrametadata::Initialize(); }
  ~LibraryScope() { ovrametadata::Terminate(); }
  LibraryScope(const LibraryScope&) = delete;
  LibraryScope& operator=(const LibraryScope&) = delete;
};

// Initialises the library and registers a test definitions document once
// (the registry keeps it until the last Terminate).
inline void InitializeWithDefinitions(const char* definitions, const char* namespaceURI) {
  ovrametadata::Initialize();
  if (!ovrametadata::NamespaceDefinition(namespaceURI))
    ovrametadata::ParseBufferAndRegisterDefinitions(definitions, U16(namespaceURI), false);
}

// The path of a registered property; fails the test when it does not resolve.
inline ovrametadata::Path PathOf(const std::string& namespaceURI, const std::string& name) {
  ovrametadata::Path path = ovrametadata::PathForSchemaNameAndPropertyName(namespaceURI, name);
  EXPECT_FALSE(path.description.empty()) << namespaceURI << name;
  return path;
}

template <typename Paths>
std::vector<std::string> Descriptions(const Paths& paths) {
  std::vector<std::string> result;
  for (const ovrametadata::Path& path : paths) result.push_back(path.description);
  return result;
}

template <class T>
inline std::string Optional(const boost::optional<T>& value) {
  std::ostringstream out;
  if (value) {
    out << *value;
  } else {
    out << "-";
  }
  return out.str();
}

inline void DescribeTexts(std::ostream& out, const ovrametadata::LocalizedDefinition& d) {
  out << " label=" << U8(d.label) << " [" << U8(d.labelSource) << "] description="
      << U8(d.description) << " [" << U8(d.descriptionSource) << "]";
}

inline void DescribeEntry(std::ostream& out, const ovrametadata::EntryDefinition& entry, const std::string& indent) {
  out << indent << entry.name << " type=" << Optional(entry.type)
      << " extends=" << Optional(entry.extends) << " element=" << Optional(entry.constraints.elementType)
      << " pattern=" << Optional(entry.constraints.pattern) << " min=" << Optional(entry.constraints.min)
      << " max=" << Optional(entry.constraints.max)
      << " deprecated=" << Optional(entry.constraints.deprecated);
  DescribeTexts(out, entry);
  out << "\n";
  for (const auto& choice : entry.constraints.choices) {
    out << indent << "  choice " << choice->rawValue << " " << U8(choice->label) << " ["
        << U8(choice->labelSource) << "]\n";
  }
  for (const auto& qualifier : entry.constraints.qualifiers) {
    out << indent << "  qualifier " << qualifier->namespaceURI << " " << qualifier->prefix << "\n";
    DescribeEntry(out, *qualifier, indent + "    ");
  }
}

// Everything a definitions document yields, as text (so that a difference
// shows where it is); withHints adds the dynamic mark and the presentation
// hints.
inline std::string Describe(const ovrametadata::DefinitionsPair& pair, bool withHints = true) {
  std::ostringstream out;
  for (const auto& schema : pair.first) {
    out << "schema " << schema->namespaceURI << " " << schema->prefix;
    if (withHints) out << " dynamic=" << schema->isDynamic;
    DescribeTexts(out, *schema);
    out << "\n";
    for (const auto& property : schema->properties) {
      out << "  property internal=" << property->isInternal;
      if (withHints && property->uiHints) {
        out << " separator=" << property->uiHints->separatorAfter
            << " multiLine=" << property->uiHints->multiLine;
      }
      out << "\n";
      DescribeEntry(out, *property, "    ");
    }
  }
  for (const auto& type : pair.second) {
    out << "type\n";
    DescribeEntry(out, *type, "  ");
    for (const auto& field : type->fields) {
      out << "  field " << field->namespaceURI << " " << field->prefix << "\n";
      DescribeEntry(out, *field, "    ");
    }
  }
  return out.str();
}

}  // namespace ovratest
