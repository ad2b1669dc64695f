// The collection of the failure simulation systems a script opened.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "automation/QFCFaultboxComEnumVariant.h"
#include "automation/QFCOwnerProvider.h"

namespace faultbox {

class QFCOpenDocuments;
class QFCSystemImpl;

class QFCSystemsImpl : public QFCOwnerProvider<QFCOpenDocuments>,
                       public std::enable_shared_from_this<QFCSystemsImpl> {
 public:
  explicit QFCSystemsImpl(QFCOpenDocuments* owner) : QFCOwnerProvider(owner) {}

  // By name (without regard to case) or position; resource strings 6713, 6714.
  [[nodiscard]] HRESULT Item(const Variant& index, std::shared_ptr<QFCSystemImpl>& system);
  [[nodiscard]] HRESULT get_Count(std::int32_t& count);
  [[nodiscard]] HRESULT get_Names(std::vector<std::string>& names);
  // Opens the document `fileName`, with `pinFile` (when not empty) in place
  // of the pin file it names.
  [[nodiscard]] HRESULT Open(const std::string& fileName, const std::string& pinFile,
               std::shared_ptr<QFCSystemImpl>& system);
  [[nodiscard]] HRESULT Open(const std::string& fileName, std::shared_ptr<QFCSystemImpl>& system) {
    return Open(fileName, {}, system);
  }
  [[nodiscard]] HRESULT CloseAll();
  [[nodiscard]] HRESULT get__NewEnum(std::shared_ptr<QFCEnumVariant>& newEnum);

  // For the enumerator.
  int LiveCount() const;
  std::shared_ptr<QFCAutomationObject> LiveAt(int index) const;

 private:
  std::shared_ptr<QFCSystemImpl> WrapperAt(QFCOpenDocuments& documents, int index) const;
};

}  // namespace faultbox
