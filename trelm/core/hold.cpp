// The undo/redo stack behind theHold.
#include <trelm/core/hold.h>
#include <trelm/core/sdk_errors.h>

#include <algorithm>
#include <deque>
#include <memory>
#include <vector>

namespace TrelmSDK {

Hold theHold;

namespace {
using Records = std::vector<std::unique_ptr<RestoreObj>>;

struct Step {
    MSTR name;
    Records records;
};

// Restoring a record may free objects, which purges the stacks; so records and steps are always
// taken out of the stacks before they are destroyed or replayed.
void RestoreBackwards(Records& records, bool isUndo) {
    for (auto it = records.rbegin(); it != records.rend(); ++it) (*it)->Restore(isUndo);
}

// Moves the records that refer to object out of records into doomed.
void TakeReferring(Records& records, const void* object, Records& doomed) {
    auto keep = std::stable_partition(records.begin(), records.end(),
                                      [object](const auto& r) { return !r->RefersTo(object); });
    std::move(keep, records.end(), std::back_inserter(doomed));
    records.erase(keep, records.end());
}
} // namespace

struct Hold::Impl {
    std::vector<Records> levels; // open Begin levels, innermost last
    std::deque<Step> undo;       // most recent last
    std::deque<Step> redo;       // next to redo last
    int suspend = 0;
    bool restoring = false;
    bool redoing = false;
    size_t maxSteps = 100;

    void Trim() {
        while (undo.size() > maxSteps) {
            Step doomed = std::move(undo.front());
            undo.pop_front();
        }
    }
};

Hold::Impl& Hold::impl() const {
    if (!impl_) impl_ = new Impl;
    return *impl_;
}

void Hold::Begin() {
    impl().levels.emplace_back();
}

void Hold::Put(RestoreObj* rob) {
    if (!rob) return;
    std::unique_ptr<RestoreObj> owned(rob);
    if (Holding()) impl().levels.back().push_back(std::move(owned));
}

void Hold::Accept(const MSTR& name) {
    auto& d = impl();
    if (d.levels.empty()) {
        ReportSDKError(L"theHold.Accept called without a matching Begin");
        return;
    }
    Records records = std::move(d.levels.back());
    d.levels.pop_back();
    if (!d.levels.empty()) {
        auto& parent = d.levels.back();
        std::move(records.begin(), records.end(), std::back_inserter(parent));
        return;
    }
    if (records.empty()) return;
    for (auto& r : records) r->EndHold();
    std::deque<Step> doomed = std::move(d.redo);
    d.redo.clear();
    d.undo.push_back({name, std::move(records)});
    d.Trim();
}

void Hold::Cancel() {
    auto& d = impl();
    if (d.levels.empty()) {
        ReportSDKError(L"theHold.Cancel called without a matching Begin");
        return;
    }
    Records records = std::move(d.levels.back());
    d.levels.pop_back();
    d.restoring = true;
    RestoreBackwards(records, false);
    d.restoring = false;
}

void Hold::Restore() {
    auto& d = impl();
    if (d.levels.empty()) return;
    Records records = std::move(d.levels.back());
    d.levels.back().clear();
    d.restoring = true;
    RestoreBackwards(records, false);
    d.restoring = false;
}

void Hold::Suspend() {
    ++impl().suspend;
}

void Hold::Resume() {
    auto& d = impl();
    if (d.suspend == 0) {
        ReportSDKError(L"theHold.Resume called without a matching Suspend");
        return;
    }
    --d.suspend;
}

bool Hold::IsSuspended() const {
    return impl().suspend > 0;
}

bool Hold::Holding() const {
    auto& d = impl();
    return !d.levels.empty() && d.suspend == 0 && !d.restoring && !d.redoing;
}

bool Hold::Restoring() const {
    return impl().restoring;
}
bool Hold::Redoing() const {
    return impl().redoing;
}
bool Hold::RestoreOrRedoing() const {
    return impl().restoring || impl().redoing;
}
int Hold::Level() const {
    return static_cast<int>(impl().levels.size());
}

bool Hold::Undo() {
    auto& d = impl();
    if (!d.levels.empty()) {
        ReportSDKError(L"Undo is not possible while an undo step is open");
        return false;
    }
    if (d.undo.empty() || d.restoring || d.redoing) return false;
    Step step = std::move(d.undo.back());
    d.undo.pop_back();
    d.restoring = true;
    RestoreBackwards(step.records, true);
    d.restoring = false;
    d.redo.push_back(std::move(step));
    return true;
}

bool Hold::Redo() {
    auto& d = impl();
    if (!d.levels.empty()) {
        ReportSDKError(L"Redo is not possible while an undo step is open");
        return false;
    }
    if (d.redo.empty() || d.restoring || d.redoing) return false;
    Step step = std::move(d.redo.back());
    d.redo.pop_back();
    d.redoing = true;
    for (auto& r : step.records) r->Redo();
    d.redoing = false;
    d.undo.push_back(std::move(step));
    d.Trim();
    return true;
}

int Hold::NumUndoSteps() const {
    return static_cast<int>(impl().undo.size());
}
int Hold::NumRedoSteps() const {
    return static_cast<int>(impl().redo.size());
}
MSTR Hold::UndoName() const {
    return impl().undo.empty() ? MSTR() : impl().undo.back().name;
}
MSTR Hold::RedoName() const {
    return impl().redo.empty() ? MSTR() : impl().redo.back().name;
}

void Hold::SetMaxSteps(int steps) {
    auto& d = impl();
    d.maxSteps = static_cast<size_t>(std::max(1, steps));
    d.Trim();
}

void Hold::ClearStacks() {
    auto& d = impl();
    std::deque<Step> undo = std::move(d.undo), redo = std::move(d.redo);
    d.undo.clear();
    d.redo.clear();
}

void Hold::Purge(const void* object) {
    // Objects are torn down at exit too; there is nothing to purge before the first record.
    if (!impl_ || !object) return;
    auto& d = *impl_;
    Records doomed;
    for (auto& level : d.levels) TakeReferring(level, object, doomed);
    for (auto* stack : {&d.undo, &d.redo}) {
        for (auto& step : *stack) TakeReferring(step.records, object, doomed);
        std::erase_if(*stack, [](const Step& s) { return s.records.empty(); });
    }
}

} // namespace TrelmSDK
