// Questions about the host's model that the element events and the class
// diagram handling ask, in the ATL model they keep: an interface is a class
// stereotyped "interface", a coclass one stereotyped "coclass", and the
// class that implements a coclass in code one stereotyped "atlobject"; only
// classes whose language is "VC++" count.
#pragma once

#include "automation/object.h"

namespace kpx {

// Empties `result` (a class collection) and fills it with the ATL object
// classes of every "VC++" coclass realizing `interfaceClass`. A class
// reached through two coclasses is added twice. Failures go to the caller.
void FindAtlObjectClasses(const ObjectPtr& interfaceClass, const ObjectPtr& result);

// Empties `result` and fills it with the ATL object classes of `coclass`.
// Failures go to the caller.
void FindCoclassAtlObjects(const ObjectPtr& coclass, const ObjectPtr& result);

// The role of `association` that a caller standing at `cls` follows. For an
// association of a class with itself: Role1 when it is navigable, else
// Role2. Never raises: a failure returns what was found so far.
ObjectPtr FindOtherRole(const ObjectPtr& association, const ObjectPtr& cls);

}  // namespace kpx
