#include "ViewShow.h"

#include <iostream>
#include <sstream>

#include "Names.h"
#include "TextUtil.h"

namespace ovrameta {

using namespace ovrametadata;

namespace {

// The built-in views in the order a reader of a panel expects them: what
// the picture is, where and by whom, then the technical data.
const char* const kViewOrder[] = {"Description", "Origin",    "IPTCCore", "IPTCExtension", "Rights",
                                  "CameraData",  "GPS",       "Video",    "Audio",         "FileProperties"};

std::string Indent(int depth) { return std::string(static_cast<std::size_t>(depth) * 2, ' '); }

// A localisation key or plain text, as the library localises item labels.
std::string Localized(const std::string& text) {
  ViewItem item;
  item.label = text;
  return ToUTF8(item.GetLabel());
}

// What one item printed, and whether that includes a value.
struct Block {
  enum Kind { kValue, kSeparator, kOther };
  Kind kind = kOther;
  std::string text;
  bool hasValue = false;
};

class ViewPrinter : public ViewBuilderInterface {
 public:
  // skip: compact, see CompactViewText.
  ViewPrinter(XMPMetaRef xmp, ShownKeys* skip) : mXmp(xmp), mPrune(skip != nullptr), mSkip(skip) {}

  void BeginView(const ViewInfo& info) override {
    mHeading = Localized(info.label.empty() ? info.name : info.label);
    mPrune = mPrune || info.pruneEmptyProperties;
  }
  void BuildItem(const ViewItemPtr& item) override {
    if (item) mBlocks.push_back(Render(*item, 1));
  }
  void EndView(const ViewDefinition&) override {
    std::string body;
    mHasValue = Join(mBlocks, body);
    if (mHasValue || !mPrune) mText = mHeading + "\n" + body;
  }
  const std::string& Text() const { return mText; }

 private:
  // Joins the blocks of one container. When pruning, empty blocks go, and
  // so do separators that would no longer separate anything.
  bool Join(const std::vector<Block>& blocks, std::string& out) const {
    bool any = false;
    std::vector<const Block*> kept;
    for (const Block& block : blocks) {
      any = any || block.hasValue;
      if (block.text.empty()) continue;
      if (mPrune && block.kind == Block::kSeparator && (kept.empty() || kept.back()->kind == Block::kSeparator))
        continue;
      kept.push_back(&block);
    }
    if (mPrune)
      while (!kept.empty() && kept.back()->kind == Block::kSeparator) kept.pop_back();
    for (const Block* block : kept) out += block->text;
    return any;
  }

  Block Render(const ViewItem& item, int depth) {
    const bool compact = mSkip != nullptr;
    if (item.widget == "separator") return compact ? Block() : Block{Block::kSeparator, Indent(depth) + "--\n", false};
    if (item.widget == "note") {
      if (compact) return {};
      const std::string text = ToUTF8(item.GetLabel());
      if (text.empty()) return {};
      std::ostringstream out;
      PrintLines(out, Indent(depth), "", text);
      return {Block::kOther, out.str(), false};
    }
    if (!item.path.description.empty()) return RenderProperty(item, depth);
    return RenderGroup(item, ToUTF8(item.GetLabel()), depth);
  }

  // A section, or any item that only holds others: its label as a heading.
  Block RenderGroup(const ViewItem& item, const std::string& label, int depth) {
    std::vector<Block> children;
    for (const ViewItemPtr& child : item.items)
      if (child) children.push_back(Render(*child, label.empty() ? depth : depth + 1));
    std::string body;
    const bool hasValue = Join(children, body);
    if (mPrune && !hasValue) return {};
    return {Block::kValue, (label.empty() ? std::string() : Indent(depth) + label + "\n") + body, hasValue};
  }

  Block RenderProperty(const ViewItem& item, int depth) {
    // What panels cannot show is left out, as a host's panel leaves it out.
    if (!IsPropertyUISupported(item.path)) return {};
    const std::string key = ShownKey(item.path.namespaceURI, item.path.description);
    if (mSkip && mSkip->count(key)) return {};
    const std::string name = NameOfPath(item.path);
    std::string label = ToUTF8(item.GetLabel());
    if (label.empty()) label = name;
    // Never raw: that flips a process-wide switch while other threads read.
    ValueNode node;
    if (!ReadValue(mXmp, item.path, name, ReadOptions(), node)) {
      if (!item.items.empty()) return RenderGroup(item, label + ":", depth);
      if (mPrune) return {};
      return {Block::kValue, Indent(depth) + label + ":\n", false};
    }
    if (mSkip) mSkip->insert(key);
    // A structure whose fields the view lists: those fields, in its order.
    if (node.kind == ValueNode::kStruct && !node.mixed && !item.items.empty())
      return RenderGroup(item, label + ":", depth);
    node.label = label;
    if (node.kind == ValueNode::kSimple) {
      for (const auto& choice : item.choices)
        if (choice && choice->rawValue == node.read) node.value = LabelOr(choice->label, node.read);
    }
    std::ostringstream out;
    PrintNode(out, node, depth);
    return {Block::kValue, out.str(), true};
  }

  XMPMetaRef mXmp;
  bool mPrune;
  ShownKeys* mSkip;
  std::string mHeading;
  std::vector<Block> mBlocks;
  bool mHasValue = false;
  std::string mText;
};

void PrintItemLayout(std::ostream& out, const ViewItem& item, int depth) {
  out << Indent(depth) << (item.widget.empty() ? (item.path.description.empty() ? "item" : "property") : item.widget);
  if (!item.path.description.empty()) out << ' ' << NameOfPath(item.path);
  const std::string label = ToUTF8(item.GetLabel());
  if (!label.empty()) out << "  \"" << label << '"';
  for (const auto& [name, value] : item.params) out << "  " << name << '=' << value;
  if (!item.choices.empty()) {
    out << "  choices:";
    for (const auto& choice : item.choices)
      if (choice) out << ' ' << choice->rawValue << '=' << LabelOr(choice->label, choice->rawValue);
  }
  out << '\n';
  for (const ViewItemPtr& child : item.items)
    if (child) PrintItemLayout(out, *child, depth + 1);
}

}  // namespace

std::vector<ErrorInfo> LoadViews(bool quiet) {
  const std::size_t before = GetErrorInfos().size();
  LoadAllViewDefinitions();
  std::vector<ErrorInfo> infos = GetErrorInfos();
  infos.erase(infos.begin(), infos.begin() + static_cast<std::ptrdiff_t>(std::min(before, infos.size())));
  for (const ErrorInfo& info : quiet ? std::vector<ErrorInfo>() : infos) {
    const std::string source = ToUTF8(info.source);
    std::cerr << "ovrameta: " << (source.empty() ? "" : source + ": ") << "warning: " << ToUTF8(info.message)
              << std::endl;
  }
  return infos;
}

std::vector<ViewDefinitionPtr> ShownViews() {
  std::vector<ViewDefinitionPtr> views;
  for (const char* name : kViewOrder)
    if (const ViewDefinitionPtr view = GetViewDefinitionForName(name)) views.push_back(view);
  for (const ViewDefinitionPtr& view : CommonViewDefinitions())
    if (std::find(views.begin(), views.end(), view) == views.end()) views.push_back(view);
  return views;
}

std::string ShownKey(const std::string& namespaceURI, const std::string& description) {
  return namespaceURI + '\n' + description;
}

std::string ViewText(XMPMetaRef xmp, const ViewDefinitionPtr& view) {
  ViewPrinter printer(xmp, nullptr);
  BuildView(view, printer);
  return printer.Text();
}

std::string CompactViewText(XMPMetaRef xmp, const ViewDefinitionPtr& view, ShownKeys& shown) {
  ViewPrinter printer(xmp, &shown);
  BuildView(view, printer);
  return printer.Text();
}

void PrintViewLayout(std::ostream& out, const ViewDefinition& view) {
  out << view.name << "  \"" << Localized(view.label.empty() ? view.name : view.label) << '"'
      << (view.pruneEmptyProperties ? "  (empty items hidden)" : "") << '\n';
  if (!view.description.empty()) out << "  " << Localized(view.description) << '\n';
  for (const ViewItemPtr& item : view.items)
    if (item) PrintItemLayout(out, *item, 1);
}

std::string NameOfPath(const Path& path) {
  for (const SchemaDefinitionPtr& schema : KnownSchemas())
    if (schema->namespaceURI == path.namespaceURI) return schema->prefix + ":" + path.description;
  return path.description;
}

}  // namespace ovrameta
