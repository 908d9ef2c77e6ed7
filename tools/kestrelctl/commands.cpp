// SPDX-License-Identifier: Apache-2.0
// Each sub-command reads its options, makes one call of the store and prints the result. What
// may be stored and how is the store's business.
#include "kestrelctl/commands.h"

#include <array>
#include <iostream>
#include <map>
#include <memory>
#include <string>
#include <utility>

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

// The options of all sub-commands. An argument may be empty, so it is counted when it is given.
struct Options {
  ObjectId id;
  std::string field, value, type, file;
  std::string layer, from, to, host, label;
  size_t idParts = 0;
  bool hasField = false;
  bool keepGoing = false;
  bool origin = false;
};

void checkLayer(const char *option, const std::string &layer) {
  if (!layer.empty() && layer.front() == '/' && layer.back() != '/') return;
  throw Failure(Tools::kExitUsage, std::string(option) + ": \"" + printable(layer) +
                                       "\" does not begin with '/', or ends with it");
}

// The store of the configuration, or the one layer of it that --layer names. Null: there is none.
std::shared_ptr<Kestrel::Backend> openStore(const Options &options, Access access) {
  Kestrel::Configuration configuration = Kestrel::readConfiguration();
  if (!options.layer.empty()) {
    checkLayer("--layer", options.layer);
    if (configuration.engine != Kestrel::Engine::kEtcd) {
      throw Failure(Tools::kExitUsage, "--layer: an SQLite store has no layers");
    }
    configuration.prefixes = {options.layer};
  }
  auto store = Kestrel::openBackend(configuration, access);
  if (store) return store;
  throw Failure(Tools::kExitNotFound, configuration.path + ": there is no store");
}

Failure noObject(const Options &options) {
  return {Tools::kExitNotFound, printable(describe(options.id)) + ": no such object"};
}

Failure noField(const Options &options) {
  return {Tools::kExitNotFound,
          printable(describe(options.id)) + ": no such field: " + printable(options.field)};
}

Kestrel::Value valueOf(const Options &options) {
  if (options.type.empty()) return Kestrel::parseByForm(options.value);
  const auto type = Kestrel::typeNamed(options.type);
  if (!type) {
    throw Kestrel::ValueError("--type: \"" + printable(options.type) + "\" is none of " +
                              std::string(Kestrel::kTypeNames));
  }
  return Kestrel::parseAs(*type, options.value);
}

// The command line is checked before a store is touched.
Kestrel::Value checkedValue(const Options &options) {
  try {
    Kestrel::checkId(options.id);
    Kestrel::checkFieldName(options.field);
    return valueOf(options);
  } catch (const Kestrel::ValueError &error) {
    throw Failure(Tools::kExitUsage, error.what());
  }
}

ExitStatus set(const Options &options) {
  const Kestrel::Value value = checkedValue(options);
  openStore(options, Access::kCreate)->setField(options.id, options.field, value);
  return Tools::kExitSuccess;
}

void printFields(const std::string &before, const Kestrel::Fields &fields) {
  for (const auto &[name, value] : fields) {
    std::cout << before << printable(name) << '\t' << typeName(typeOf(value)) << '\t'
              << printable(print(value)) << '\n';
  }
}

// Each field with the layer that it comes from: the first that has it.
ExitStatus printOrigins(Kestrel::Backend &store, const Options &options) {
  std::map<std::string, std::pair<Kestrel::Value, std::string>> fields;
  const auto layers = store.layers(options.id);
  for (const auto &[layer, layerFields] : layers) {
    for (const auto &[name, value] : layerFields) fields.emplace(name, std::pair(value, layer));
  }
  if (layers.empty()) throw noObject(options);
  if (options.hasField && fields.count(options.field) == 0) throw noField(options);
  for (const auto &[name, found] : fields) {
    if (options.hasField && name != options.field) continue;
    const auto &[value, layer] = found;
    std::cout << printable(name) << '\t' << typeName(typeOf(value)) << '\t'
              << printable(print(value)) << '\t' << printable(layer) << '\n';
  }
  return Tools::kExitSuccess;
}

ExitStatus get(const Options &options) {
  const auto store = openStore(options, Access::kRead);
  if (options.origin) return printOrigins(*store, options);
  const auto fields = store->read(options.id);
  if (!fields) throw noObject(options);
  if (!options.hasField) {
    printFields("", *fields);
    return Tools::kExitSuccess;
  }
  const auto found = fields->find(options.field);
  if (found == fields->end()) throw noField(options);
  std::cout << print(found->second) << '\n';
  return Tools::kExitSuccess;
}

// What another host reads, by this host's configuration.
ExitStatus resolve(const Options &options) {
  const Kestrel::HostNames names{options.host, options.label};
  const Kestrel::Configuration configuration = Kestrel::readConfiguration(&names);
  const auto store = Kestrel::openBackend(configuration, Access::kRead);
  if (!store) throw Failure(Tools::kExitNotFound, configuration.path + ": there is no store");
  return printOrigins(*store, options);
}

ExitStatus move(const Options &options) {
  checkLayer("--from", options.from);
  checkLayer("--to", options.to);
  if (options.from == options.to) throw Failure(Tools::kExitUsage, "--from and --to are the same");
  const auto store = openStore(options, Access::kChange);
  if (!store->move(options.id, options.from, options.to)) throw noObject(options);
  return Tools::kExitSuccess;
}

ExitStatus remove(const Options &options) {
  const auto store = openStore(options, Access::kChange);
  const bool removed = options.hasField ? store->removeField(options.id, options.field)
                                        : store->removeObject(options.id);
  if (!removed) throw options.hasField ? noField(options) : noObject(options);
  return Tools::kExitSuccess;
}

void printDamage(std::ostream &out, const std::vector<Kestrel::Damage> &damaged) {
  for (const auto &[name, why] : damaged) out << printable(name) << ": " << printable(why) << '\n';
}

// The objects of a listing. A damaged one is an error, unless the user wants the others.
const std::vector<Kestrel::StoredObject> &objectsOf(const Kestrel::Listing &listing,
                                                    const Options &options) {
  if (listing.damaged.empty()) return listing.objects;
  if (!options.keepGoing) {
    const auto &[name, why] = listing.damaged.front();
    throw Failure(Tools::kExitFailure,
                  printable(name) + ": " + printable(why) + " (" +
                      std::to_string(listing.damaged.size()) +
                      " damaged in all: see kestrelctl check; --keep-going leaves them out)");
  }
  std::cerr << "kestrelctl: damaged objects are left out:\n";
  printDamage(std::cerr, listing.damaged);
  return listing.objects;
}

ExitStatus list(const Options &options) {
  Kestrel::Selection selection;
  if (options.idParts > 0) selection.component = options.id.component;
  if (options.idParts > 1) selection.group = options.id.group;
  const Kestrel::Listing listing = openStore(options, Access::kRead)->list(selection);
  for (const auto &[id, fields] : objectsOf(listing, options)) {
    const std::string object = printable(id.component) + '\t' + printable(id.group) + '\t' +
                               printable(id.key) + '\t' + printable(id.extra);
    if (fields.empty()) std::cout << object << "\t\t\t\n";
    printFields(object + '\t', fields);
  }
  return listing.damaged.empty() ? Tools::kExitSuccess : Tools::kExitFailure;
}

ExitStatus exportStore(const Options &options) {
  const Kestrel::Listing listing = openStore(options, Access::kRead)->list({});
  writeExchangeFile(options.file, objectsOf(listing, options));
  return listing.damaged.empty() ? Tools::kExitSuccess : Tools::kExitFailure;
}

ExitStatus check(const Options &options) {
  const Kestrel::Listing listing = openStore(options, Access::kRead)->list({});
  printDamage(std::cout, listing.damaged);
  return listing.damaged.empty() ? Tools::kExitSuccess : Tools::kExitFailure;
}

ExitStatus importStore(const Options &options) {
  const auto objects = readExchangeFile(options.file);
  openStore(options, Access::kCreate)->replace(objects);
  return Tools::kExitSuccess;
}

ExitStatus status(const Options &) {
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
    case Kestrel::Condition::kLimited:
    case Kestrel::Condition::kUnusable:
      break;
  }
  throw Failure(Tools::kExitFailure, report.problem);
}

void declareIdOptions(CLI::App &command, Options *options) {
  command.add_option("COMPONENT", options->id.component, "First part of the object's name")
      ->required();
  command.add_option("GROUP", options->id.group, "Second part of the object's name")->required();
  command.add_option("KEY", options->id.key, "Third part of the object's name")->required();
  command.add_option("--extra", options->id.extra, "Fourth part of the object's name")
      ->type_name("TEXT");
}

void declareLayer(CLI::App &command, Options *options) {
  command.add_option("--layer", options->layer, "The prefix to use, of several")
      ->type_name("PREFIX");
}

void declareSetOptions(CLI::App &command, Options *options) {
  declareIdOptions(command, options);
  declareLayer(command, options);
  command.add_option("FIELD", options->field, "Name of the field")->required();
  command.add_option("VALUE", options->value, "Its value; put -- before one that begins with -")
      ->required();
  command
      .add_option("--type", options->type, "integer, real, boolean or text; otherwise by its form")
      ->type_name("TYPE");
}

void declareFieldOptions(CLI::App &command, Options *options) {
  declareIdOptions(command, options);
  command.add_option("FIELD", options->field, "Only this field")
      ->each([options](const std::string &) { options->hasField = true; });
}

void declareDeleteOptions(CLI::App &command, Options *options) {
  declareFieldOptions(command, options);
  declareLayer(command, options);
}

void declareGetOptions(CLI::App &command, Options *options) {
  declareDeleteOptions(command, options);
  command.add_flag("--origin", options->origin, "Print the layer of each field, too");
}

void declareResolveOptions(CLI::App &command, Options *options) {
  declareFieldOptions(command, options);
  command.add_option("--as", options->host, "The host's name, for %H")->type_name("HOST");
  command.add_option("--label", options->label, "The host's label, for %L")->type_name("LABEL");
}

void declareMoveOptions(CLI::App &command, Options *options) {
  declareIdOptions(command, options);
  command.add_option("--from", options->from, "The prefix that has the object")
      ->type_name("PREFIX")
      ->required();
  command.add_option("--to", options->to, "The prefix that gets it")
      ->type_name("PREFIX")
      ->required();
}

void declareKeepGoing(CLI::App &command, Options *options) {
  command.add_flag("--keep-going", options->keepGoing,
                   "Leave damaged objects out, and report them on standard error");
}

void declareListOptions(CLI::App &command, Options *options) {
  declareLayer(command, options);
  const auto count = [options](const std::string &) { ++options->idParts; };
  command.add_option("COMPONENT", options->id.component, "Only this component")->each(count);
  command.add_option("GROUP", options->id.group, "Only this group")->each(count);
  declareKeepGoing(command, options);
}

void declareExportOptions(CLI::App &command, Options *options) {
  declareLayer(command, options);
  command.add_option("FILE", options->file, "File to write instead of standard output");
  declareKeepGoing(command, options);
}

void declareImportOptions(CLI::App &command, Options *options) {
  declareLayer(command, options);
  command.add_option("FILE", options->file, "File to read; - is standard input")->required();
}

void declareNoOptions(CLI::App &, Options *) {}

constexpr std::array<Tools::Command<Options>, 10> kCommands = {{
    {"set", "Writes one field of an object", declareSetOptions, set},
    {"get", "Prints a field's value, or all fields of an object", declareGetOptions, get},
    {"delete", "Deletes a field, or a whole object", declareDeleteOptions, remove},
    {"list", "Prints all fields, one per line", declareListOptions, list},
    {"check", "Prints the damaged objects", declareLayer, check},
    {"export", "Writes all objects as YAML", declareExportOptions, exportStore},
    {"import", "Puts a file's objects in the store, all or none", declareImportOptions,
     importStore},
    {"resolve", "Prints what a host reads, and from which layer", declareResolveOptions, resolve},
    {"move", "Moves an object from one layer to another", declareMoveOptions, move},
    {"status", "Prints which store this is and whether it can be used", declareNoOptions, status},
}};

}  // namespace

void addCommands(CLI::App &app, Tools::Action *action) {
  Tools::addCommands(app, kCommands, action);
}

}  // namespace Kestrelctl
