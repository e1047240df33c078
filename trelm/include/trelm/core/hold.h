// The undo system: records of changes grouped into named steps on an undo/redo stack.
#pragma once

#include <trelm/core/mstr.h>

namespace TrelmSDK {

// One undoable change. Restore puts back the state before the change, Redo the state after it.
class RestoreObj {
public:
    virtual ~RestoreObj() = default;
    // isUndo is true for a user's undo, false when a Cancel throws the change away.
    virtual void Restore(bool isUndo) = 0;
    virtual void Redo() = 0;
    // Approximate memory the record holds, in bytes.
    virtual int Size() { return 1; }
    // The step holding this record was accepted.
    virtual void EndHold() {}
    virtual MSTR Description() const { return L"---"; }
    // Whether the record points at object; records pointing at an object that goes away are
    // dropped (Hold::Purge).
    virtual bool RefersTo(const void* object) const {
        (void)object;
        return false;
    }
};

// The host's undo system (one instance: theHold). A user action is bracketed by Begin and
// Accept(name); every change made in between that Put()s a record becomes part of that step.
// Begin/Accept/Cancel nest: an inner Accept hands its records to the enclosing level, an inner
// Cancel restores and drops only its own. Suspend/Resume (nested) keep changes out of the stack.
// Main thread only.
class Hold {
public:
    constexpr Hold() = default;
    Hold(const Hold&) = delete;
    Hold& operator=(const Hold&) = delete;

    void Begin();
    // Takes ownership of rob. Kept when Holding(), otherwise deleted at once.
    void Put(RestoreObj* rob);
    // Closes the innermost level; at the outermost level the records become one undo step named
    // name (nothing is pushed when no record was made) and the redo stack is emptied.
    void Accept(const MSTR& name);
    // The same with a resource string, which may be missing (none): the step is then unnamed.
    void Accept(const MCHAR* name) { Accept(MSTR(name ? name : L"")); }
    // Closes the innermost level, restoring and dropping its records.
    void Cancel();
    // Restores the current level's records without closing it (as Cancel followed by Begin).
    void Restore();

    void Suspend();
    void Resume();
    bool IsSuspended() const;

    // True inside Begin/Accept, not suspended, and not undoing or redoing.
    bool Holding() const;
    bool Restoring() const;
    bool Redoing() const;
    bool RestoreOrRedoing() const;
    // Begin nesting depth.
    int Level() const;

    // The host's Undo and Redo commands; false when there is nothing to do or a step is open.
    bool Undo();
    bool Redo();
    int NumUndoSteps() const;
    int NumRedoSteps() const;
    // Name of the step Undo (Redo) would take back (redo); empty when none.
    MSTR UndoName() const;
    MSTR RedoName() const;
    // The oldest steps are dropped beyond this many (default 100; at least 1).
    void SetMaxSteps(int steps);
    // Empties both stacks (open levels stay).
    void ClearStacks();
    // Drops every record that RefersTo(object), in open levels and on both stacks.
    void Purge(const void* object);

private:
    struct Impl;
    Impl& impl() const;
    mutable Impl* impl_ = nullptr; // created on first use, never freed: records may outlive exit
};

// The undo system.
extern Hold theHold;

} // namespace TrelmSDK

using TrelmSDK::Hold;
using TrelmSDK::RestoreObj;
using TrelmSDK::theHold;
