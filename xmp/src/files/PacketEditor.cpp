// Edits of a stored packet, property by property (see PacketEditor.h).
#include "PacketEditor.h"

#include <algorithm>

namespace ovraxmp {
namespace detail {
namespace {

std::string EscapeAttribute(const std::string& text) {
  std::string out;
  for (char c : text) {
    if (c == '&') out += "&amp;";
    else if (c == '<') out += "&lt;";
    else if (c == '"') out += "&quot;";
    else out += c;
  }
  return out;
}

std::string Declaration(const std::string& prefix, const std::string& uri) {
  return " xmlns:" + prefix + "=\"" + EscapeAttribute(uri) + "\"";
}

// The fragment's lines moved to indent (its first line's own indentation
// is its base).
std::string Reindent(const std::string& text, const std::string& indent) {
  const std::size_t first = text.find_first_not_of(" \t");
  const std::size_t base = first == std::string::npos ? 0 : first;
  std::string out;
  std::size_t start = 0;
  bool firstLine = true;
  while (start <= text.size()) {
    std::size_t end = text.find('\n', start);
    if (end == std::string::npos) end = text.size();
    std::string line = text.substr(start, end - start);
    std::size_t strip = 0;
    while (strip < base && strip < line.size() && (line[strip] == ' ' || line[strip] == '\t')) ++strip;
    line.erase(0, strip);
    if (!firstLine) out += "\n" + indent;
    out += line;
    firstLine = false;
    start = end + 1;
  }
  return out;
}

// The padding of an XMP packet: blanks, a line end every 100 bytes.
std::string Padding(std::size_t length) {
  std::string out(length, ' ');
  for (std::size_t i = 0; i < length; ++i)
    if ((i + 1) % 100 == 0 || i + 1 == length) out[i] = '\n';
  return out;
}

}  // namespace

bool PacketEditor::Load(std::string text, std::string* problem) {
  mText = std::move(text);
  mEdits.clear();
  return ScanPacket(mText, problem, &mLayout);
}

bool PacketEditor::Has(const std::string& ns, const std::string& name) const {
  return std::any_of(mLayout.properties.begin(), mLayout.properties.end(),
                     [&](const PacketLayout::Property& p) { return p.ns == ns && p.name == name; });
}

void PacketEditor::Put(const std::string& ns, const std::string& name, Fragment fragment) {
  Remove(ns, name);
  mEdits.back().fragment = std::move(fragment);
}

void PacketEditor::Remove(const std::string& ns, const std::string& name) {
  // The last edit of a property is the one that counts.
  mEdits.erase(std::remove_if(mEdits.begin(), mEdits.end(),
                              [&](const Edit& e) { return e.ns == ns && e.name == name; }),
               mEdits.end());
  mEdits.push_back({ns, name, std::nullopt});
}

std::string PacketEditor::Indentation(std::size_t at) const {
  std::size_t start = at;
  while (start > 0 && (mText[start - 1] == ' ' || mText[start - 1] == '\t')) --start;
  if (start > 0 && mText[start - 1] != '\n' && mText[start - 1] != '\r') return std::string();
  return mText.substr(start, at - start);
}

std::vector<std::tuple<std::string, std::string, std::size_t>> PacketEditor::PropertySizes() const {
  std::vector<std::tuple<std::string, std::string, std::size_t>> sizes;
  for (const auto& p : mLayout.properties) sizes.emplace_back(p.ns, p.name, p.end - p.begin);
  std::stable_sort(sizes.begin(), sizes.end(),
                   [](const auto& a, const auto& b) { return std::get<2>(a) > std::get<2>(b); });
  return sizes;
}

std::optional<std::string> PacketEditor::Render(std::optional<std::size_t> length, std::size_t growthPadding) const {
  const std::size_t descriptions = mLayout.descriptions.size();
  std::vector<std::map<std::string, std::string>> scopes;
  for (const auto& description : mLayout.descriptions) scopes.push_back(description.scope);
  std::vector<std::string> declarations(descriptions), inserts(descriptions);
  std::vector<Change> changes;

  // The fragment with its prefixes bound where it lands: on the
  // description when the prefix is free there, on the fragment itself when
  // the description binds it to another namespace.
  const auto bind = [&](std::size_t d, const Fragment& fragment) {
    std::string local;
    for (const auto& ns : fragment.namespaces) {
      const auto bound = scopes[d].find(ns.first);
      if (bound != scopes[d].end() && bound->second == ns.second) continue;
      if (bound == scopes[d].end()) {
        scopes[d][ns.first] = ns.second;
        declarations[d] += Declaration(ns.first, ns.second);
      } else {
        local += Declaration(ns.first, ns.second);
      }
    }
    std::string text = fragment.text;
    if (!local.empty()) {
      const std::size_t open = text.find('<');
      const std::size_t nameEnd = text.find_first_of(" \t\r\n/>", open);
      if (open != std::string::npos && nameEnd != std::string::npos) text.insert(nameEnd, local);
    }
    return text;
  };
  const auto removal = [&](const PacketLayout::Property& p) {
    std::size_t start = p.begin;
    if (!p.attribute) {
      // The element's whole line goes, when it has one to itself.
      while (start > 0 && (mText[start - 1] == ' ' || mText[start - 1] == '\t')) --start;
      if (start > 0 && mText[start - 1] == '\n') --start;
      if (start > 0 && mText[start - 1] == '\r') --start;
      if (start == p.begin || (start < p.begin && mText[start] != '\n' && mText[start] != '\r')) start = p.begin;
    }
    changes.push_back({start, p.end - start, std::string()});
  };

  for (const Edit& edit : mEdits) {
    const PacketLayout::Property* element = nullptr;
    std::optional<std::size_t> home;
    for (const auto& p : mLayout.properties) {
      if (p.ns != edit.ns || p.name != edit.name) continue;
      if (!home) home = p.description;
      if (edit.fragment && !element && !p.attribute) {
        element = &p;
        continue;
      }
      removal(p);
    }
    if (!edit.fragment) continue;
    if (element) {
      const std::string text = bind(element->description, *edit.fragment);
      changes.push_back({element->begin, element->end - element->begin, Reindent(text, Indentation(element->begin))});
      continue;
    }
    if (!home) {
      // A new property goes where its namespace is already declared, else
      // into the first description.
      home = 0;
      for (std::size_t d = 0; d < descriptions; ++d) {
        const auto& scope = mLayout.descriptions[d].scope;
        if (std::any_of(scope.begin(), scope.end(), [&](const auto& b) { return b.second == edit.ns; })) {
          home = d;
          break;
        }
      }
    }
    const std::size_t d = *home;
    std::string indent;
    for (const auto& p : mLayout.properties) {
      if (p.description == d && !p.attribute) {
        indent = Indentation(p.begin);
        break;
      }
    }
    if (indent.empty()) indent = Indentation(mLayout.descriptions[d].begin) + " ";
    inserts[d] += "\n" + indent + Reindent(bind(d, *edit.fragment), indent);
  }

  for (std::size_t d = 0; d < descriptions; ++d) {
    const PacketLayout::Description& description = mLayout.descriptions[d];
    const bool emptyTag = description.tagEnd >= 2 && mText[description.tagEnd - 2] == '/';
    const std::size_t tagClose = description.tagEnd - (emptyTag ? 2 : 1);
    if (!declarations[d].empty()) changes.push_back({tagClose, 0, declarations[d]});
    if (inserts[d].empty()) continue;
    if (description.empty) {
      const std::size_t nameEnd = mText.find_first_of(" \t\r\n/>", description.begin + 1);
      const std::string name = mText.substr(description.begin + 1, nameEnd - description.begin - 1);
      changes.push_back({tagClose, description.tagEnd - tagClose,
                         ">" + inserts[d] + "\n" + Indentation(description.begin) + "</" + name + ">"});
    } else {
      std::size_t at = description.closeBegin;
      while (at > description.tagEnd && std::string(" \t\r\n").find(mText[at - 1]) != std::string::npos) --at;
      changes.push_back({at, 0, inserts[d]});
    }
  }

  std::stable_sort(changes.begin(), changes.end(), [](const Change& a, const Change& b) { return a.at < b.at; });
  std::string body;
  std::size_t cursor = 0;
  for (const Change& change : changes) {
    if (change.at < cursor || change.at + change.length > mLayout.rootEnd) return std::nullopt;
    body.append(mText, cursor, change.at - cursor);
    body += change.text;
    cursor = change.at + change.length;
  }
  body.append(mText, cursor, mLayout.rootEnd - cursor);

  // What follows the root: padding, the end marker, trailing NULs.
  const std::string tail = mText.substr(mLayout.rootEnd);
  const std::size_t marker = tail.rfind("<?xpacket end");
  std::string trailer;
  std::string oldPadding = tail;
  if (marker != std::string::npos) {
    trailer = tail.substr(marker);
    oldPadding = tail.substr(0, marker);
  } else {
    const std::size_t nuls = tail.size() - (tail.find_last_not_of('\0') == std::string::npos
                                                ? 0
                                                : tail.find_last_not_of('\0') + 1);
    trailer = std::string(nuls, '\0');
    oldPadding = tail.substr(0, tail.size() - nuls);
  }
  if (length) {
    if (body.size() + trailer.size() > *length) return std::nullopt;
    return body + Padding(*length - body.size() - trailer.size()) + trailer;
  }
  return body + (marker != std::string::npos ? Padding(growthPadding) : oldPadding) + trailer;
}

}  // namespace detail
}  // namespace ovraxmp
