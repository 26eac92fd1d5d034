// The lazy child and leaf ranges over the definitions tree.
#include <algorithm>
#include <deque>
#include <utility>

#include <boost/iterator/iterator_facade.hpp>
#include <boost/make_shared.hpp>
#include <boost/range/iterator_range.hpp>

#include <ovraxmp/XMPToolkit.h>

#include "paths/PathsInternal.h"

namespace ovrametadata {
namespace detail {

namespace {

class SinglePathSource final : public PathSource {
 public:
  explicit SinglePathSource(Path path) : mPath(std::move(path)) {}
  std::size_t Count() const override { return 1; }
  Path At(std::size_t) const override { return mPath; }

 private:
  Path mPath;
};

class PropertyPathSource final : public PathSource {
 public:
  explicit PropertyPathSource(boost::shared_ptr<SchemaDefinition> schema)
      : mSchema(std::move(schema)) {}
  std::size_t Count() const override { return mSchema->properties.size(); }
  Path At(std::size_t index) const override {
    return CreatePathFromSchemaProperty(mSchema, mSchema->properties[index]);
  }

 private:
  boost::shared_ptr<SchemaDefinition> mSchema;
};

class FieldPathSource final : public PathSource {
 public:
  FieldPathSource(Path parent, boost::shared_ptr<TypeDefinition> type, bool arrayed)
      : mParent(std::move(parent)), mType(std::move(type)), mArrayed(arrayed) {}
  std::size_t Count() const override { return mType->fields.size(); }
  Path At(std::size_t index) const override {
    const auto& field = mType->fields[index];
    if (!mArrayed) return CreatePathFromStructureField(mParent, field);
    try {
      return CreatePathFromArrayedStructureField(mParent, field);
    } catch (const ovraxmp::XMP_Error&) {
      // Same answer as for a plain structure field the toolkit cannot
      // address, so that a walk never throws.
      return Path();
    }
  }

 private:
  Path mParent;
  boost::shared_ptr<TypeDefinition> mType;
  bool mArrayed;
};

// Deeper than any real schema; stops a walk through types that contain
// themselves through more than one level.
constexpr std::size_t kMaxWalkDepth = 32;

// Depth-first, pre-order walk that stops at leaves. Each frame is a pending
// range of siblings; the innermost is at the back.
class LeafWalkIterator
    : public boost::iterator_facade<LeafWalkIterator, Path, boost::bidirectional_traversal_tag,
                                    Path> {
 public:
  LeafWalkIterator() = default;
  LeafWalkIterator(boost::shared_ptr<const PathSource> root, bool atEnd)
      : mRoot(std::move(root)), mAtEnd(atEnd) {
    if (!mAtEnd) Restart();
  }

 private:
  friend class boost::iterator_core_access;

  struct Frame {
    boost::shared_ptr<const PathSource> source;
    std::size_t count = 0;
    std::size_t index = 0;
    boost::shared_ptr<TypeDefinition> type;
  };

  Path dereference() const { return mCurrent; }
  bool equal(const LeafWalkIterator& other) const {
    return mAtEnd == other.mAtEnd && (mAtEnd || mPosition == other.mPosition);
  }
  void increment() {
    if (mAtEnd) return;
    ++mStack.back().index;
    ++mPosition;
    Settle();
  }
  // Walks are meant to go forwards; stepping back replays the walk from the
  // start up to the previous leaf.
  void decrement() {
    std::size_t target = mPosition;
    if (mAtEnd) {
      LeafWalkIterator counter(mRoot, false);
      target = 0;
      while (!counter.mAtEnd) {
        counter.increment();
        ++target;
      }
    }
    if (target == 0) return;
    Restart();
    while (mPosition + 1 < target) increment();
  }

  void Restart() {
    mStack.clear();
    mPosition = 0;
    mAtEnd = false;
    if (mRoot) mStack.push_back(Frame{mRoot, mRoot->Count(), 0, nullptr});
    Settle();
  }

  bool IsOnStack(const boost::shared_ptr<TypeDefinition>& type) const {
    return std::any_of(mStack.begin(), mStack.end(),
                       [&](const Frame& frame) { return frame.type == type; });
  }

  // Moves from the current position to the first leaf at or after it.
  void Settle() {
    while (!mStack.empty()) {
      Frame& top = mStack.back();
      if (top.index >= top.count) {
        mStack.pop_back();
        if (!mStack.empty()) ++mStack.back().index;
        continue;
      }
      Path node = top.source->At(top.index);
      if (node.namespaceURI.empty() && node.description.empty()) {
        ++top.index;  // a child that could not be addressed
        continue;
      }
      boost::shared_ptr<TypeDefinition> type;
      auto children = ChildSource(node, &type);
      if (!children || children->Count() == 0) {
        mCurrent = std::move(node);
        return;
      }
      if (mStack.size() >= kMaxWalkDepth || (type && IsOnStack(type))) {
        ++top.index;  // a type that contains itself: not a leaf, not walked
        continue;
      }
      const std::size_t count = children->Count();
      mStack.push_back(Frame{std::move(children), count, 0, std::move(type)});
    }
    mAtEnd = true;
    mCurrent = Path();
  }

  boost::shared_ptr<const PathSource> mRoot;
  std::deque<Frame> mStack;
  Path mCurrent;
  std::size_t mPosition = 0;
  bool mAtEnd = true;
};

Range<Path> MakeLeafRange(const boost::shared_ptr<const PathSource>& root) {
  return boost::make_iterator_range(LeafWalkIterator(root, false), LeafWalkIterator(root, true));
}

}  // namespace

Range<Path> MakeRange(const boost::shared_ptr<const PathSource>& source) {
  if (!source) return Range<Path>();
  return boost::make_iterator_range(PathSourceIterator(source, 0),
                                    PathSourceIterator(source, source->Count()));
}

boost::shared_ptr<const PathSource> ChildSource(const Path& path,
                                                boost::shared_ptr<TypeDefinition>* type) {
  const auto entry = PathEntryDefinition(path);
  if (!entry) return nullptr;
  auto entryType = TypeOfEntry(path, *entry);
  if (!entryType) return nullptr;
  const bool array = IsEntryAnArray(path, *entry, false);
  if (type) *type = entryType;
  if (entryType->fields.empty()) {
    if (!array) return nullptr;
    return boost::make_shared<SinglePathSource>(CreatePathFromElementType(path, entry, entryType));
  }
  return boost::make_shared<FieldPathSource>(path, std::move(entryType), array);
}

}  // namespace detail

Range<Path> ChildPaths(const Path& path) {
  return detail::MakeRange(detail::ChildSource(path, nullptr));
}

Range<Path> ChildPaths(const boost::shared_ptr<SchemaDefinition>& schema) {
  if (!schema) return Range<Path>();
  return detail::MakeRange(boost::make_shared<detail::PropertyPathSource>(schema));
}

bool IsPathLeaf(const Path& path) {
  const auto children = detail::ChildSource(path, nullptr);
  return !children || children->Count() == 0;
}

Range<Path> DescendantLeafPaths(const Path& path) {
  return detail::MakeLeafRange(boost::make_shared<detail::SinglePathSource>(path));
}

Range<Path> DescendantLeafPaths(const boost::shared_ptr<SchemaDefinition>& schema) {
  if (!schema) return Range<Path>();
  return detail::MakeLeafRange(boost::make_shared<detail::PropertyPathSource>(schema));
}

}  // namespace ovrametadata
