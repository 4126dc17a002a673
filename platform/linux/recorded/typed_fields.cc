#include "platform/linux/recorded/typed_fields.h"

#include <algorithm>

#include "base/format.h"

namespace tavrel {
namespace {

using Form = RecordedField::Form;

struct FormOfValue {
  plist::Kind kind;
  const char* words;
};

// Indexed by `RecordedField::Form`.
constexpr FormOfValue kForms[] = {
    {plist::Kind::Number, "an integer"},
    {plist::Kind::Array, "an array of integers"},
    {plist::Kind::String, "a string"},
    {plist::Kind::Data, "data, in JSON {\"$data\": \"BASE64\"}"},
    {plist::Kind::Array, "an array"},
    {plist::Kind::Dictionary, "a dictionary"},
};

constexpr const FormOfValue& described(Form form) {
  return kForms[static_cast<std::size_t>(form)];
}

bool hasForm(const plist::Value& value, Form form) {
  if (value.kind() != described(form).kind) return false;
  if (form == Form::Integer) return wordOf(value).has_value();
  const plist::Array array = value.array();
  return form != Form::Integers || std::all_of(array.begin(), array.end(), wordOf);
}

}  // namespace

const char* missedForm(std::span<const RecordedField> fields, const plist::Entry& entry) {
  const auto field = std::find_if(fields.begin(), fields.end(), [&](const RecordedField& known) {
    return entry.key == known.key;
  });
  if (field == fields.end() || hasForm(entry.value, field->form)) return nullptr;
  return described(field->form).words;
}

std::string faultOf(std::span<const RecordedField> fields, const plist::Dictionary& record) {
  for (const plist::Entry& entry : record) {
    if (const char* const wanted = missedForm(fields, entry)) {
      return format("its \"%s\" must be %s", entry.key, wanted);
    }
  }
  return {};
}

}  // namespace tavrel
