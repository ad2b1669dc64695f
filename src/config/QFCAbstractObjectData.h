// The common base of the model objects (systems, hardware descriptions, ECUs,
// pins, patterns, pattern pins, folders): name, kind, owner, observers, and
// the questions every object answers through its owner chain.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace faultbox {

class Archive;
class QFCAbstractObjectData;

// Anything that shows a model object (a view, the navigator, a script's
// event sink) and wants to hear of its changes.
class QFCObjectObserver {
 public:
  virtual ~QFCObjectObserver() = default;
  virtual void OnUpdate(QFCAbstractObjectData* sender, int hint, void* extra) = 0;
};

// Something whose life must end with a model object's, such as the object's
// automation wrapper, which has to learn that the object is gone.
class QFCObjectAttachment {
 public:
  virtual ~QFCObjectAttachment() = default;
};

class QFCAbstractObjectData {
 public:
  // Object kind codes; the system is the object of kind 1 at the top of every
  // owner chain. Pins and pattern pins share kind 5.
  enum Kind : std::int32_t {
    kKindNone = 0,
    kKindSystem = 1,
    kKindFolder = 2,
    kKindPattern = 3,
    kKindEcu = 4,
    kKindPin = 5,
    kKindHardwareInfo = 6,
  };
  using PropertyTable = std::map<std::string, std::string>;

  QFCAbstractObjectData(std::string name, std::int32_t kind, QFCAbstractObjectData* owner);
  virtual ~QFCAbstractObjectData();
  QFCAbstractObjectData(const QFCAbstractObjectData&) = delete;
  QFCAbstractObjectData& operator=(const QFCAbstractObjectData&) = delete;

  // Stores or loads the object in a document; the base holds nothing to store.
  virtual void Serialize(Archive& ar);
  virtual QFCAbstractObjectData* GetOwner() const { return owner_; }
  void SetOwner(QFCAbstractObjectData* owner) { owner_ = owner; }
  // The text a list shows for the object.
  virtual std::string GetDisplayText() const { return {}; }
  // Fills `table` with the labelled properties a property window shows.
  virtual void GetProperties(PropertyTable& table) const { table.clear(); }

  // These questions belong to the system: each object forwards them to its
  // owner, and the system (kind 1, its own owner) answers them. An object
  // without an owner is neither connected, activated nor read-only.
  virtual bool IsConnected() const;
  virtual bool IsPatternActivated() const;
  // The document that holds the system cannot be written.
  virtual bool IsReadOnly() const;
  // Marks that document modified; the system ignores it while read-only.
  virtual void SetModified();

  // Set while loading when the document differs from the pin file (pins lost
  // from it, pin values that differ); the document then reports it and comes
  // up modified.
  void SetChanged(bool changed) { changed_ = changed; }
  bool IsChanged() const { return changed_; }

  // The object of kind 1 up the owner chain, or nullptr.
  QFCAbstractObjectData* GetSystem() const;

  const std::string& GetName() const { return name_; }
  void SetName(std::string name) { name_ = std::move(name); }
  std::int32_t GetKind() const { return kind_; }

  void AddObserver(QFCObjectObserver* observer);
  void RemoveObserver(QFCObjectObserver* observer);
  const std::vector<QFCObjectObserver*>& GetObservers() const { return observers_; }
  // Tells every observer; an observer may remove itself while being told.
  void NotifyObservers(int hint = 0, void* extra = nullptr);

  // The object keeps one attachment and destroys it when the object itself
  // goes away; setting another destroys the one held.
  void SetAttachment(std::unique_ptr<QFCObjectAttachment> attachment) { attachment_ = std::move(attachment); }
  QFCObjectAttachment* GetAttachment() const { return attachment_.get(); }

 private:
  // The owner to forward a question to, or nullptr at the top.
  QFCAbstractObjectData* Upward() const { return owner_ != this ? owner_ : nullptr; }

  std::string name_;
  std::int32_t kind_;
  QFCAbstractObjectData* owner_;
  std::vector<QFCObjectObserver*> observers_;
  bool changed_ = false;
  std::unique_ptr<QFCObjectAttachment> attachment_;
};

}  // namespace faultbox
