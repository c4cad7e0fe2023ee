// The fields of messages and records, as definition files have them (docs/commands.md).
#ifndef KRAL_COMMANDS_DEFINED_FIELD_XML_H
#define KRAL_COMMANDS_DEFINED_FIELD_XML_H

#include <initializer_list>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "base/xml_attributes.h"
#include "commands/defined/definition.h"

namespace kral::defined {

// What the fields of a file share, and how far its reading has got.
struct FileContext {
  std::map<std::string, std::shared_ptr<const Enumeration>, std::less<>> enumerations;
  std::map<std::string, const XmlElement*, std::less<>> records;
  const XmlElement* at = nullptr;  // what is being read, for messages
  size_t fields = 0;               // so far
  bool big_endian = false;         // of fields that do not say
};

// Reads one message. Throws BadXml for fields that contradict themselves or each other.
class FieldReader {
 public:
  FieldReader(FileContext& file, Message& message) : file_(file), message_(message) {}

  void Read(const XmlElement& element);

 private:
  // A group whose fields are being read: the message, or one inside.
  struct Scope {
    std::vector<Field>& fields;
    const Scope* outer;  // whose fields can be referred to; none for a named record
    uint32_t depth;
    uint32_t capacity;
    std::string prefix;
  };

  void ReadFields(const std::vector<XmlElement>& elements, const Scope& scope);
  Field ReadField(const XmlElement& element, const Scope& scope);
  void ReadType(const XmlElement& element, Field& field);
  void ReadNumber(const XmlElement& element, Field& field);
  void ReadExtents(const XmlElement& element, const Scope& scope, Field& field);
  Extent ReadExtent(const XmlElement& element, const char* name, const char* most_name, uint64_t limit,
                    const Scope& scope);
  void ReadMembers(const XmlElement& element, const Scope& scope, Field& field);
  void ReadBits(const XmlElement& element, const Scope& scope, Field& word);
  void ReadRecord(const std::string& name, const Scope& scope, Field& field);
  Condition ReadCondition(const std::string& text, const Scope& scope) const;
  const Field& Resolve(const std::string& name, const Scope& scope, Reference& reference) const;
  void NameField(const XmlElement& element, const Scope& scope, Field& field);
  void GiveSlot(Field& field);
  void Complete(std::vector<Field>& fields);
  void CheckEnds(const std::vector<XmlElement>& elements, const std::vector<Field>& fields);

  FileContext& file_;
  Message& message_;
  std::vector<std::string> expanding_;  // records
  uint32_t next_slot_ = 0;
  std::vector<uint32_t> counters_;  // slots
};

// Refuses attributes that are not among these, and text, which no element has.
void RefuseOthers(const XmlElement& element, std::initializer_list<std::string_view> known);
// Refuses elements inside as well.
void RefuseInside(const XmlElement& element);
// Whether the name is a type without being a record's.
bool IsType(std::string_view name);
// Letters, digits and underscores, not too many.
void RequireName(const XmlElement& element, const std::string& name, bool may_begin_with_digit);
// The fewest bytes that a field takes when it is there.
size_t ShortestOf(const Field& field);

}  // namespace kral::defined

#endif
