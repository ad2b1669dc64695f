// A folder of the pattern tree a system shows in its navigator: a name,
// sub-folders and references to patterns of the same system.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "config/QFCAbstractObjectData.h"

namespace faultbox {

class Archive;
class QFCAbstractFailurePattern;
class QFCFailurePatterns;

class QFCFailurePatternNode : public QFCAbstractObjectData {
 public:
  // Folder records nest at most this deep (the root counts as one); a deeper
  // stored tree is damaged, and no deeper tree is built.
  static constexpr int kMaxDepth = 64;

  // `patterns` is the system's collection, where stored references are looked up.
  QFCFailurePatternNode(QFCAbstractObjectData* system, QFCFailurePatterns* patterns,
                        QFCFailurePatternNode* parent = nullptr);
  ~QFCFailurePatternNode() override;

  // The root's name is always the resource text; others their stored name.
  std::string GetName() const;
  // Ignored for the root.
  void SetName(std::string name);
  bool IsRoot() const { return parent_ == nullptr; }
  QFCFailurePatternNode* GetParent() const { return parent_; }
  // 1 for the root.
  int GetDepth() const;

  // A new sub-folder, appended; nullptr when it would nest deeper than kMaxDepth.
  QFCFailurePatternNode* CreateChild(const std::string& name);
  // Appends a reference (a pattern may be listed more than once); false for none.
  bool AddPattern(QFCAbstractFailurePattern* pattern);
  // Removes the first reference; false when the pattern is not listed.
  bool RemovePatternRef(const QFCAbstractFailurePattern* pattern);
  // Removes every reference to the pattern from this folder and all below it;
  // answers how many went.
  int RemovePatternEverywhere(const QFCAbstractFailurePattern* pattern);
  // Destroys the sub-folders and forgets the references.
  void RemoveAll();

  int GetChildCount() const { return static_cast<int>(children_.size()); }
  QFCFailurePatternNode* GetChildAt(int index) const;
  int GetPatternCount() const { return static_cast<int>(patterns_.size()); }
  QFCAbstractFailurePattern* GetPatternAt(int index) const;

  // One folder record: name, children (name, then the child's record), then
  // the names of the referenced patterns. Names without a pattern are dropped.
  void Serialize(Archive& ar) override;

 private:
  void Store(Archive& ar) const;
  void Load(Archive& ar, int depth);

  QFCFailurePatterns* collection_;
  QFCFailurePatternNode* parent_;
  std::string name_;
  std::vector<QFCAbstractFailurePattern*> patterns_;
  std::vector<std::unique_ptr<QFCFailurePatternNode>> children_;
};

}  // namespace faultbox
