// SPDX-License-Identifier: Apache-2.0
// What groups have been given: reading it from their records or files, changing it, and keeping the
// sums and the protection of everything above in step. The caller holds the lock on the tree, but
// for reading, and where it is said that none is needed.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "knob/admission.h"
#include "knob/linux/file_values.h"
#include "knob/linux/groups.h"
#include "knob/linux/record.h"
#include "knob/linux/writes.h"

namespace Knob::Linux {

// A group's books, and whether they stand in a record of its own.
struct Held {
  Record record;  // what the files say, where there is no record
  bool isStored = false;
  bool isDamaged = false;  // there is a record that cannot be read
};

// A control file that should hold something else.
struct Deviation {
  Control control;
  std::string expected;
  std::optional<std::string> actual;  // absent: there is no such file
};

// The sum of two amounts of which the second is not negative. Amounts beyond every machine, as only
// a record written by somebody else holds them, stay that.
int64_t saturatedSum(int64_t left, int64_t right);

// "memory.max is 5, not max".
std::string textOf(const Deviation &deviation);

class Bookkeeper {
 public:
  Bookkeeper(Groups &groups, const HostFacts &facts) : groups_(groups), facts_(facts) {}

  Held read(Group &group) const;

  // Checks the whole change, then applies the whole. Throws KernelError: bad parameter, reservation
  // refused, memory busy.
  void change(Group &group, Resource resource, const AllocationChange &change);

  // The first CPU settings of a new group, without the lock: the record first, which cannot be made
  // when there is one, then the files, then a look at whether the record is still that one. False,
  // and nothing is changed: somebody else has made the record, or it is not such a change; change()
  // is to be called. Throws KernelError: bad parameter, not found.
  bool changeNew(Group &group, const AllocationChange &change);

  // Makes the record of a new group that has been given something. Needs no lock.
  void recordNew(Group &group) noexcept;

  // Takes a deleted child's reservations out of its parent and all above. child: as it was.
  void releaseChild(Group &parent, const Held &child);

  // What the files of a group should hold according to its record.
  std::vector<Deviation> deviations(Group &group, const Record &record) const;

 private:
  struct Place;
  Held readToChange(Group &group) const;
  void restoreCpu(Group &group);
  void takeBackCpu(Group &group, const Record &made) noexcept;
  std::vector<Deviation> compare(Group &group, const Record &record) const;
  void changeHeld(Group &group, Held held, Resource resource, const AllocationChange &change);
  // A group that somebody else gave a minimum, and that now gets a record, is one more reservation:
  // whether it was, and is counted now.
  bool count(Group &group, const Held &held);
  void apply(Group &group, const Held &held, Resource resource, const Allocation &wanted);
  std::vector<Place> placesFrom(GroupPtr group, Resource resource, int64_t before, int64_t after);
  std::vector<ResourceState> admitted(const ResourceState &own, const std::vector<Place> &above,
                                      Resource resource, const Allocation &wanted) const;
  void writeControls(Writes &writes, Group &group, const Values &from, const Values &to) const;
  void writeOwn(Writes &writes, Group &group, const Held &held, Resource resource,
                const Allocation &wanted) const;
  void writeSums(Writes &writes, const std::vector<Place> &above, Resource resource,
                 const std::vector<ResourceState> &levels) const;

  Groups &groups_;
  const HostFacts &facts_;
};

}  // namespace Knob::Linux
