// The failure classes of a system and each failure class, as scripts see them.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "automation/QFCFaultboxComEnumVariant.h"
#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCAbstractFailureClass;
class QFCSystem;

// Reaches the collection through its system, which may read its failure
// class file anew.
class QFCFailureClassesImpl : public QFCOwnerProvider<QFCSystem>,
                              public std::enable_shared_from_this<QFCFailureClassesImpl> {
 public:
  explicit QFCFailureClassesImpl(QFCSystem* owner) : QFCOwnerProvider(owner) {}

  // By name (exactly) or position.
  [[nodiscard]] HRESULT Item(const Variant& index, std::shared_ptr<class QFCFailureClassImpl>& failureClass);
  [[nodiscard]] HRESULT get_Count(std::int32_t& count);
  [[nodiscard]] HRESULT get_Names(std::vector<std::string>& names);
  [[nodiscard]] HRESULT get_Version(std::string& version);
  [[nodiscard]] HRESULT get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum);

  // For the enumerator.
  int LiveCount() const;
  std::shared_ptr<QFCAutomationObject> LiveAt(int index) const;
};

class QFCFailureClassImpl : public QFCOwnerProvider<QFCAbstractFailureClass> {
 public:
  QFCFailureClassImpl(QFCAbstractFailureClass* owner, QFCSystem* system)
      : QFCOwnerProvider(owner), system_(system) {}

  [[nodiscard]] HRESULT get_Name(std::string& name);
  [[nodiscard]] HRESULT get_Description(std::string& description);
  [[nodiscard]] HRESULT get_Limitation(std::string& limitation);
  [[nodiscard]] HRESULT get_Format(std::string& format);
  [[nodiscard]] HRESULT get_ID(std::int32_t& id);
  // The number of relay vectors of the class.
  [[nodiscard]] HRESULT get_RelayVectorSize(std::int32_t& size);

  // Also detaches a wrapper whose class left its system's collection.
  bool IsAttached() const override;
  void Detach() override;

 private:
  template <class Body>
  [[nodiscard]] HRESULT Read(Body&& body);

  QFCSystem* system_;
};

}  // namespace faultbox
