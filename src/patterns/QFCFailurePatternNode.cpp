// The pattern folders: their tree, their pattern references and their record.
#include "patterns/QFCFailurePatternNode.h"
#include "platform/MessageTable.h"

#include <algorithm>

#include "patterns/QFCAbstractFailurePattern.h"
#include "patterns/QFCFailurePatterns.h"
#include "platform/Archive.h"

namespace faultbox {

namespace {

constexpr int kResRootName = 6768;

// The smallest stored child: its name, then a record of a name and two counts.
constexpr std::size_t kMinChildBytes = 1 + 1 + 4 + 4;

}  // namespace

QFCFailurePatternNode::QFCFailurePatternNode(QFCAbstractObjectData* system, QFCFailurePatterns* patterns,
                                             QFCFailurePatternNode* parent)
    : QFCAbstractObjectData(std::string(), kKindFolder, system), collection_(patterns), parent_(parent) {}

QFCFailurePatternNode::~QFCFailurePatternNode() = default;

std::string QFCFailurePatternNode::GetName() const {
  if (IsRoot()) return ResourceText(kResRootName);
  return name_;
}

void QFCFailurePatternNode::SetName(std::string name) {
  if (!IsRoot()) name_ = std::move(name);
}

int QFCFailurePatternNode::GetDepth() const {
  int depth = 1;
  for (const QFCFailurePatternNode* node = parent_; node != nullptr; node = node->parent_) ++depth;
  return depth;
}

QFCFailurePatternNode* QFCFailurePatternNode::CreateChild(const std::string& name) {
  // A tree deeper than loading accepts would save into a file that cannot be opened.
  if (GetDepth() >= kMaxDepth) return nullptr;
  children_.push_back(std::make_unique<QFCFailurePatternNode>(GetOwner(), collection_, this));
  children_.back()->SetName(name);
  return children_.back().get();
}

bool QFCFailurePatternNode::AddPattern(QFCAbstractFailurePattern* pattern) {
  if (pattern == nullptr) return false;
  patterns_.push_back(pattern);
  return true;
}

bool QFCFailurePatternNode::RemovePatternRef(const QFCAbstractFailurePattern* pattern) {
  auto it = std::find(patterns_.begin(), patterns_.end(), pattern);
  if (pattern == nullptr || it == patterns_.end()) return false;
  patterns_.erase(it);
  return true;
}

int QFCFailurePatternNode::RemovePatternEverywhere(const QFCAbstractFailurePattern* pattern) {
  const auto before = patterns_.size();
  patterns_.erase(std::remove(patterns_.begin(), patterns_.end(), pattern), patterns_.end());
  int removed = static_cast<int>(before - patterns_.size());
  for (const auto& child : children_) removed += child->RemovePatternEverywhere(pattern);
  return removed;
}

void QFCFailurePatternNode::RemoveAll() {
  children_.clear();
  patterns_.clear();
}

QFCFailurePatternNode* QFCFailurePatternNode::GetChildAt(int index) const {
  if (index < 0 || index >= GetChildCount()) return nullptr;
  return children_[static_cast<std::size_t>(index)].get();
}

QFCAbstractFailurePattern* QFCFailurePatternNode::GetPatternAt(int index) const {
  if (index < 0 || index >= GetPatternCount()) return nullptr;
  return patterns_[static_cast<std::size_t>(index)];
}

void QFCFailurePatternNode::Serialize(Archive& ar) {
  if (ar.IsStoring())
    Store(ar);
  else
    Load(ar, GetDepth());
}

void QFCFailurePatternNode::Store(Archive& ar) const {
  ar.WriteString(GetName());
  ar.WriteU32(static_cast<std::uint32_t>(children_.size()));
  for (const auto& child : children_) {
    ar.WriteString(child->GetName());
    child->Store(ar);
  }
  ar.WriteU32(static_cast<std::uint32_t>(patterns_.size()));
  for (const QFCAbstractFailurePattern* pattern : patterns_) ar.WriteString(pattern->GetName());
}

void QFCFailurePatternNode::Load(Archive& ar, int depth) {
  if (depth > kMaxDepth) throw ArchiveException(ArchiveCause::kGeneric, "pattern folders nest too deep");
  RemoveAll();
  // The root keeps its resource name whatever was stored.
  name_ = ar.ReadString();
  const std::uint32_t childCount = ar.ReadU32CountOf(kMinChildBytes);
  for (std::uint32_t i = 0; i < childCount; ++i) {
    const std::string name = ar.ReadString();
    children_.push_back(std::make_unique<QFCFailurePatternNode>(GetOwner(), collection_, this));
    children_.back()->name_ = name;
    children_.back()->Load(ar, depth + 1);
  }
  const std::uint32_t referenceCount = ar.ReadU32CountOf(1);
  for (std::uint32_t i = 0; i < referenceCount; ++i) {
    const std::string name = ar.ReadString();
    if (QFCAbstractFailurePattern* pattern = collection_ ? collection_->FindPattern(name) : nullptr)
      patterns_.push_back(pattern);
  }
}

}  // namespace faultbox
