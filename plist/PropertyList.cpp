#include "plist/PropertyList.h"

#include "plist/BinaryPropertyList.h"
#include "plist/XmlPropertyList.h"

namespace tarn::plist {

std::string PropertyListFault::description() const {
  return (place == Place::Line ? "line " : "byte ") + std::to_string(number) + ": " + text;
}

PropertyListReading readPropertyList(std::string_view bytes) {
  return bytes.starts_with("bplist") ? readBinaryPropertyList(bytes) : readXmlPropertyList(bytes);
}

}  // namespace tarn::plist
