// SPDX-License-Identifier: Apache-2.0
// Thin: a sub-command reads its words, makes one call of the store and prints the answer. What may
// be stored and how is the store's business.
#include "kestrelctl/commands.h"

#include <array>
#include <iostream>
#include <memory>
#include <string>

#include "kestrel/object_names.h"
#include "kestrel/open.h"
#include "kestrelctl/exchange_files.h"
#include "shared/command_table.h"
#include "shared/text.h"

namespace Kestrelctl {

namespace {

using Kestrel::Access;
using Kestrel::describe;
using Kestrel::ObjectId;
using Kestrel::print;
using Kestrel::typeName;
using Kestrel::typeOf;
using Tools::ExitStatus;
using Tools::Failure;
using Tools::printable;

// The words of a command line, whichever the sub-command has. An empty word is a word too, so a
// count tells which ones were given.
struct Words {
  ObjectId id;
  std::string field, value, type, file;
  size_t idWords = 0;
  bool hasField = false;
};

// The store, for a command that makes no sense without one.
std::shared_ptr<Kestrel::Backend> existingStore(Access access) {
  const Kestrel::Configuration configuration = Kestrel::readConfiguration();
  auto store = Kestrel::openBackend(configuration, access);
  if (!store) throw Failure(Tools::kExitNotFound, configuration.path + ": there is no store");
  return store;
}

Failure noObject(const Words &words) {
  return {Tools::kExitNotFound, printable(describe(words.id)) + ": no such object"};
}

Failure noField(const Words &words) {
  return {Tools::kExitNotFound,
          printable(describe(words.id)) + ": no such field: " + printable(words.field)};
}

Kestrel::Value valueOf(const Words &words) {
  if (words.type.empty()) return Kestrel::parseByForm(words.value);
  const auto type = Kestrel::typeNamed(words.type);
  if (!type) {
    throw Kestrel::ValueError("--type: \"" + printable(words.type) + "\" is none of " +
                              std::string(Kestrel::kTypeNames));
  }
  return Kestrel::parseAs(*type, words.value);
}

// What the line says must be sound before a store is touched.
Kestrel::Value checkedValue(const Words &words) {
  try {
    Kestrel::checkId(words.id);
    Kestrel::checkFieldName(words.field);
    return valueOf(words);
  } catch (const Kestrel::ValueError &error) {
    throw Failure(Tools::kExitUsage, error.what());
  }
}

ExitStatus set(const Words &words) {
  const Kestrel::Value value = checkedValue(words);
  Kestrel::openBackend(Access::kCreate)->setField(words.id, words.field, value);
  return Tools::kExitSuccess;
}

void printFields(const std::string &before, const Kestrel::Fields &fields) {
  for (const auto &[name, value] : fields) {
    std::cout << before << printable(name) << '\t' << typeName(typeOf(value)) << '\t'
              << printable(print(value)) << '\n';
  }
}

ExitStatus get(const Words &words) {
  const auto fields = existingStore(Access::kRead)->read(words.id);
  if (!fields) throw noObject(words);
  if (!words.hasField) {
    printFields("", *fields);
    return Tools::kExitSuccess;
  }
  const auto found = fields->find(words.field);
  if (found == fields->end()) throw noField(words);
  std::cout << print(found->second) << '\n';
  return Tools::kExitSuccess;
}

ExitStatus remove(const Words &words) {
  const auto store = existingStore(Access::kChange);
  const bool removed =
      words.hasField ? store->removeField(words.id, words.field) : store->removeObject(words.id);
  if (!removed) throw words.hasField ? noField(words) : noObject(words);
  return Tools::kExitSuccess;
}

ExitStatus list(const Words &words) {
  Kestrel::Selection selection;
  if (words.idWords > 0) selection.component = words.id.component;
  if (words.idWords > 1) selection.group = words.id.group;
  for (const auto &[id, fields] : existingStore(Access::kRead)->list(selection)) {
    const std::string object = printable(id.component) + '\t' + printable(id.group) + '\t' +
                               printable(id.key) + '\t' + printable(id.extra);
    if (fields.empty()) std::cout << object << "\t\t\t\n";
    printFields(object + '\t', fields);
  }
  return Tools::kExitSuccess;
}

ExitStatus exportStore(const Words &words) {
  writeExchangeFile(words.file, existingStore(Access::kRead)->list({}));
  return Tools::kExitSuccess;
}

ExitStatus importStore(const Words &words) {
  const auto objects = readExchangeFile(words.file);
  Kestrel::openBackend(Access::kCreate)->replace(objects);
  return Tools::kExitSuccess;
}

ExitStatus status(const Words &) {
  constexpr size_t kLabelColumns = 15;
  const Kestrel::Report report = Kestrel::inspect();
  for (const auto &[label, text] : report.details) {
    std::cout << Tools::padded(label, kLabelColumns) << printable(text) << '\n';
  }
  switch (report.condition) {
    case Kestrel::Condition::kUsable:
      std::cout << Tools::padded("state", kLabelColumns) << "usable\n";
      return Tools::kExitSuccess;
    case Kestrel::Condition::kMissing:
      throw Failure(Tools::kExitNotFound, report.problem);
    case Kestrel::Condition::kUnusable:
      break;
  }
  throw Failure(Tools::kExitFailure, report.problem);
}

void idWords(CLI::App &command, Words *words) {
  command.add_option("COMPONENT", words->id.component, "First part of the object's name")
      ->required();
  command.add_option("GROUP", words->id.group, "Second part of the object's name")->required();
  command.add_option("KEY", words->id.key, "Third part of the object's name")->required();
  command.add_option("--extra", words->id.extra, "Fourth part of the object's name")
      ->type_name("TEXT");
}

void setWords(CLI::App &command, Words *words) {
  idWords(command, words);
  command.add_option("FIELD", words->field, "Name of the field")->required();
  command.add_option("VALUE", words->value, "Its value; put -- before one that begins with -")
      ->required();
  command
      .add_option("--type", words->type, "integer, real, boolean or text; otherwise by its form")
      ->type_name("TYPE");
}

void fieldWords(CLI::App &command, Words *words) {
  idWords(command, words);
  command.add_option("FIELD", words->field, "Only this field")->each([words](const std::string &) {
    words->hasField = true;
  });
}

void listWords(CLI::App &command, Words *words) {
  const auto count = [words](const std::string &) { ++words->idWords; };
  command.add_option("COMPONENT", words->id.component, "Only this component")->each(count);
  command.add_option("GROUP", words->id.group, "Only this group")->each(count);
}

void exportWords(CLI::App &command, Words *words) {
  command.add_option("FILE", words->file, "File to write instead of standard output");
}

void importWords(CLI::App &command, Words *words) {
  command.add_option("FILE", words->file, "File to read; - is standard input")->required();
}

void noWords(CLI::App &, Words *) {}

constexpr std::array<Tools::Command<Words>, 7> kCommands = {{
    {"set", "Writes one field of an object", setWords, set},
    {"get", "Prints a field's value, or all fields of an object", fieldWords, get},
    {"delete", "Deletes a field, or a whole object", fieldWords, remove},
    {"list", "Prints all fields, one a line", listWords, list},
    {"export", "Writes all objects as YAML", exportWords, exportStore},
    {"import", "Puts a file's objects in the store, all or none", importWords, importStore},
    {"status", "Tells which store this is and whether it can be used", noWords, status},
}};

}  // namespace

void addCommands(CLI::App &app, Tools::Action *action) {
  Tools::addCommands(app, kCommands, action);
}

}  // namespace Kestrelctl
