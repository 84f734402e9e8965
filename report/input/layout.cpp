#include "report/input/layout.h"

#include "report/input/json_line.h"
#include "report/input/layout_unit.h"
#include "report/input/text.h"

#include <algorithm>
#include <cstring>

namespace report {
namespace {

using namespace layout;

constexpr uint32_t kNotYet = UINT32_MAX;
constexpr uint32_t kImitation = 2 * kWorldletBound;  // more than any text and what a record prints behind it

void Wrong(LayoutReader *reader, uint32_t at, std::string_view expected, bool isText = false) {
    if (reader == nullptr) {
        return;
    }
    reader->lastWrong = at;
    reader->lastExpected = expected;
    if (at >= reader->farthest) {
        reader->wholeEnd = 0;
        reader->farthest = at;
        reader->expected = expected;
        reader->isText = isText;
    }
}

// The words of a step. `*first` tells whether its first words stood there.
Fit GoAlong(LayoutReader *reader, Unit *unit, Place place, bool *first) {
    *first = false;
    for (const Piece &piece : PiecesOf(place)) {
        Fit fit = unit->Words(piece.words, piece.size);
        if (fit != Fit::Yes) {
            if (fit == Fit::No) {
                Wrong(reader, unit->at, {piece.words, piece.size});
            }
            return fit;
        }
        *first = true;
        fit = unit->Then(piece.then);
        if (fit != Fit::Yes) {
            if (fit == Fit::No) {
                Wrong(reader, unit->at, NameOf(piece.then));
            }
            return fit;
        }
    }
    return Fit::Yes;
}

// Another port of the record. Under the strict rule it must be the one that always stood there.
bool AddPort(LayoutReader *reader, PortNumber port) {
    size_t place = reader->ports.size();
    reader->ports.push_back(port);
    if (reader->first || !reader->strict) {
        return true;
    }
    bool fits = place < reader->known.size() &&
                (!port.known || !reader->known[place].known || reader->known[place].number == port.number);
    reader->refused |= !fits;
    return fits;
}

uint64_t DeadKey(const LayoutReader *reader, const TextPlace &text) {
    uint64_t port = reader->first || !reader->strict ? 0 : text.port;
    return port << 40 | uint64_t{text.end} << 8 | text.step;
}

// Divides the text of a port that ends at `end`. False when it can't be one.
bool DividePort(const Unit &unit, TextPlace *text, uint32_t end) {
    constexpr auto kSeparator = static_cast<uint32_t>(kSwitch.size());
    std::string_view inside(unit.text + text->start, std::min(end - text->start, kNameBound + kSeparator));
    size_t name = inside.rfind(kSwitch);
    if (name == std::string_view::npos) {
        return false;
    }
    text->split = text->start + static_cast<uint32_t>(name);
    return end - text->split - kSeparator <= kSwitchBound;
}

// The next place from `from` on where the words behind a text stand.
Fit FindEnd(const Unit &unit, const Step &step, TextPlace *text, uint32_t from) {
    auto size = EndSize(step.place);
    uint32_t limit = text->start + step.bound;
    for (uint32_t at = from;; at++) {
        uint32_t room = std::min(unit.size, limit + 1);
        const void *quote = at < room ? std::memchr(unit.text + at, '"', room - at) : nullptr;
        if (quote == nullptr) {
            return room > limit || unit.last ? Fit::No : Fit::More;
        }
        at = static_cast<uint32_t>(static_cast<const char *>(quote) - unit.text);
        Unit look = {unit.text, unit.size, unit.last, at};
        Fit fit = look.Words(step.words, size);
        if (fit == Fit::More) {
            return fit;
        }
        if (fit == Fit::Yes && (step.place != NameText || DividePort(unit, text, at))) {
            text->end = at;
            return fit;
        }
    }
}

// A record that begins here, up to its loads.
Fit BeginsRecord(Unit unit) {
    Fit fit = Fit::Yes;
    bool first = false;
    for (Place place : {Record, RecordIteration, Topology}) {
        fit = fit == Fit::Yes ? GoAlong(nullptr, &unit, place, &first) : fit;
    }
    return fit;
}

// A document that begins here, up to the loads of its first record, or to its end.
Fit BeginsDocument(Unit unit) {
    Fit fit = unit.Words(kDocumentHead.data(), static_cast<uint32_t>(kDocumentHead.size()));
    if (fit != Fit::Yes) {
        return fit;
    }
    TextPlace text = {unit.at, kNotYet, 0, 0, HostName};
    for (uint32_t from = unit.at;; from = text.end + 1) {
        fit = FindEnd(unit, kSteps[HostName], &text, from);
        if (fit != Fit::Yes) {
            return fit;
        }
        unit.at = text.end + EndSize(HostName);
        Unit end = unit;
        fit = end.Words("\n] }", 4);
        fit = fit == Fit::No ? BeginsRecord(unit) : fit;
        if (fit != Fit::No) {
            return fit;
        }
    }
}

Fit BehindDocument(LayoutReader *reader, Unit unit, bool *nothing);

// The same, as far as no imitation in a text gets.
Fit ReadsDocument(LayoutReader *reader, Unit unit) {
    Fit fit = BeginsDocument(unit);
    if (fit != Fit::Yes || reader->isBehind) {
        return fit;
    }
    if (!reader->behind || reader->behindAt != unit.at) {
        reader->behind = std::make_unique<LayoutReader>();
        reader->behind->isBehind = true;
        reader->behindAt = unit.at;
        LayoutBegin(reader->behind.get(), true);
    }
    Reading reading = LayoutGoOn(reader->behind.get(), unit.text + unit.at, unit.size - unit.at, false);
    if (reading == Reading::More && reader->behind->at < kImitation) {
        fit = unit.last ? Fit::Yes : Fit::More;
        return LayoutTriesAgain(*reader->behind) && unit.last ? Fit::No : fit;
    }
    if (reading == Reading::DocumentEnd) {
        bool nothing = false;
        unit.at += reader->behind->at;
        return BehindDocument(reader->behind.get(), unit, &nothing);
    }
    return reading == Reading::Damaged ? Fit::No : Fit::Yes;
}

// Behind a document: another one, lines of records, or nothing. Blanks may divide them.
Fit BehindDocument(LayoutReader *reader, Unit unit, bool *nothing) {
    while (unit.at < unit.size && (unit.text[unit.at] == '\n' || unit.text[unit.at] == ' ')) {
        unit.at++;
    }
    *nothing = unit.at == unit.size;
    if (*nothing) {
        return Fit::Yes;
    }
    Fit fit = ReadsDocument(reader, unit);
    return fit == Fit::No ? unit.Words(kLineHead.data(), static_cast<uint32_t>(kLineHead.size())) : fit;
}

// What may stand behind a record: another one, the end of the document, or a new one where the run was killed.
// `*nothing`: all is right, and there is nothing more for now.
Fit GoesOn(LayoutReader *reader, Unit unit, bool *nothing) {
    uint32_t end = unit.at;
    *nothing = end == unit.size;
    if (*nothing || end == reader->takenEnd) {
        return Fit::Yes;
    }
    Fit otherwise = unit.last ? Fit::Yes : Fit::More;  // cut within what is right
    unit.last = false;
    Unit look = unit;
    Fit fit = look.Words("\n] }", 4);
    fit = fit == Fit::Yes ? BehindDocument(reader, look, nothing) : fit;
    if (fit == Fit::No) {
        fit = BehindDocument(reader, unit, nothing);
    }
    if (fit == Fit::No) {
        fit = unit.Words(",\n", 2);
        fit = fit == Fit::Yes ? GoAlong(reader, &unit, Record, nothing) : fit;
        int64_t iteration = 0;
        fit = fit == Fit::Yes ? unit.Whole(&iteration) : fit;
        *nothing = false;
        if (fit == Fit::Yes && reader->strict && iteration != reader->iteration + 1) {
            reader->refused = true;
            fit = Fit::No;
        }
    }
    if (fit == Fit::No) {
        Wrong(reader, end, ",\n{ \"time\": ");
        reader->wholeEnd = reader->farthest == end ? end : reader->wholeEnd;
    }
    return fit == Fit::More ? otherwise : fit;
}

// Another end of the last text that has one.
Fit GoBack(LayoutReader *reader, const Unit &unit) {
    while (!reader->texts.empty()) {
        TextPlace *text = &reader->texts.back();
        const Step &step = kSteps[text->step];
        bool tried = text->end != kNotYet;
        if (tried) {
            reader->dead.insert(DeadKey(reader, *text));
        }
        Fit fit = FindEnd(unit, step, text, tried ? text->end + 1 : text->start);
        while (fit == Fit::Yes && !reader->dead.empty() && reader->dead.contains(DeadKey(reader, *text))) {
            fit = FindEnd(unit, step, text, text->end + 1);
        }
        if (fit == Fit::Yes) {
            reader->back = false;
            reader->ports.resize(text->port);
            reader->at = text->end + EndSize(step.place);
            reader->step = step.next;
        }
        if (fit != Fit::No) {
            return fit;
        }
        if (!tried) {
            Wrong(reader, text->start, step.words, true);
        }
        reader->texts.pop_back();
    }
    return Fit::No;
}

// Along one step. `unit->at` moves only with Yes.
Fit GoOn(LayoutReader *reader, Unit *unit) {
    const Step &step = kSteps[reader->step];
    bool first = false;
    int64_t number = 0;
    uint32_t entry = 0;
    Place next = step.next;
    Fit fit = Fit::Yes;
    switch (step.op) {
    case Run:
        fit = GoAlong(reader, unit, step.place, &first);
        break;
    case Try:
        fit = GoAlong(reader, unit, step.place, &first);
        if (fit == Fit::No && !first) {
            next = step.other;
            fit = Fit::Yes;
        }
        break;
    case Text:
        reader->texts.push_back({unit->at, kNotYet, 0, static_cast<uint32_t>(reader->ports.size()), reader->step});
        reader->back = true;
        return Fit::Yes;
    case Numbers:
    case Pairs:
        fit = unit->List(step.op == Pairs, &entry);
        reader->at = entry;
        if (fit == Fit::No) {
            Wrong(reader, unit->at, "a list of numbers");
        }
        break;
    case Body:
        reader->body = unit->at + 2;
        fit = GoAlong(reader, unit, step.place, &first);
        break;
    case Iteration:
    case Id:
        fit = unit->Whole(&number);
        if (fit == Fit::No) {
            Wrong(reader, unit->at, "a whole number");
        } else if (fit == Fit::Yes && step.op == Iteration) {
            reader->iteration = number;
        } else if (fit == Fit::Yes && !AddPort(reader, {number, true})) {
            fit = Fit::No;
        }
        break;
    case Gone:
        fit = AddPort(reader, {0, false}) ? Fit::Yes : Fit::No;
        break;
    case Count:
        if (!reader->first && reader->strict && reader->ports.size() != reader->known.size()) {
            reader->refused = true;
            fit = Fit::No;
        }
        break;
    default:
        break;
    }
    if (fit == Fit::Yes) {
        reader->step = next;
        reader->at = unit->at;
    }
    return fit;
}

// Whether an end without any record is one, and not a text of the host's name.
Fit IsEmpty(LayoutReader *reader, Unit unit) {
    Fit otherwise = unit.last ? Fit::Yes : Fit::More;
    unit.last = false;
    bool nothing = false;
    Fit fit = BehindDocument(reader, unit, &nothing);
    return fit == Fit::More ? otherwise : fit;
}

// Where the words of the last step stop, the run may have been killed, and another one have put its document behind.
Fit IsCut(LayoutReader *reader, Unit unit) {
    if (reader->lastWrong < reader->at) {
        return Fit::No;  // refused by a rule
    }
    std::string_view words = reader->lastExpected;
    for (unit.at = reader->lastWrong; unit.at < unit.size; unit.at++) {
        Fit fit = unit.at > 0 ? ReadsDocument(reader, unit) : Fit::No;
        if (fit != Fit::No) {
            reader->cut = unit.at;
            return fit;
        }
        if (words.empty() || words[0] != unit.text[unit.at]) {
            break;
        }
        words.remove_prefix(1);
    }
    return Fit::No;
}

void Restart(LayoutReader *reader, bool strict) {
    reader->texts.clear();
    reader->ports.clear();
    reader->dead.clear();
    reader->at = 0;
    reader->body = 0;
    reader->step = reader->first ? Head : Next;
    reader->strict = strict;
    reader->refused = false;
    reader->back = false;
}

}  // namespace

void LayoutBegin(LayoutReader *reader, bool first) {
    reader->first = first;
    reader->farthest = 0;
    reader->wholeEnd = 0;
    reader->takenEnd = 0;
    reader->behind.reset();
    reader->expected = {};
    Restart(reader, true);
}

Reading LayoutGoOn(LayoutReader *reader, const char *text, uint32_t size, bool last) {
    for (;;) {
        Unit unit = {text, size, last, reader->at};
        Fit fit = Fit::Yes;
        bool back = reader->back;
        bool nothing = false;
        if (back) {
            fit = GoBack(reader, unit);
        } else if (reader->step == Finished) {
            fit = reader->first ? IsEmpty(reader, unit) : Fit::Yes;
            if (fit == Fit::Yes) {
                return Reading::DocumentEnd;
            }
        } else if (reader->step == RecordEnd) {
            fit = GoesOn(reader, unit, &nothing);
            if (fit == Fit::Yes) {
                return nothing && !last ? Reading::RecordSoFar : Reading::Record;
            }
        } else {
            fit = GoOn(reader, &unit);
            if (fit == Fit::No) {
                fit = IsCut(reader, unit);
                if (fit == Fit::Yes) {
                    return Reading::Cut;
                }
            }
        }
        if (fit == Fit::More) {
            return Reading::More;
        }
        if (fit == Fit::Yes) {
            continue;
        }
        if (!back) {
            reader->back = true;
        } else if (reader->strict && reader->refused) {
            Restart(reader, false);
        } else if (reader->wholeEnd != 0 && reader->takenEnd == 0) {
            reader->takenEnd = reader->wholeEnd;
            Restart(reader, reader->strict);
        } else {
            return Reading::Damaged;
        }
    }
}

bool LayoutTriesAgain(const LayoutReader &reader) {
    return reader.back && !reader.texts.empty() && reader.texts.back().end != kNotYet;
}

void LayoutAccept(LayoutReader *reader) {
    if (reader->first) {
        reader->known = reader->ports;
        return;
    }
    reader->known.resize(reader->ports.size());
    for (size_t i = 0; i < reader->ports.size(); i++) {
        if (reader->ports[i].known) {
            reader->known[i] = reader->ports[i];
        }
    }
}

namespace {

// Without line ends, and the blanks behind them.
void AppendLines(std::string *json, std::string_view text) {
    for (;;) {
        size_t size = std::min(text.find('\n'), text.size());
        json->append(text, 0, size);
        if (size == text.size()) {
            return;
        }
        text.remove_prefix(size + 1);
        text.remove_prefix(std::min(text.find_first_not_of(' '), text.size()));
    }
}

}  // namespace

void LayoutCompose(const LayoutReader &reader, const char *text, std::string_view host, std::string *json,
                   uint64_t *mended) {
    json->clear();
    json->reserve(reader.at + 2 * host.size());
    json->assign("{\"host\": \"");
    *mended = TextAppendJson(json, host) ? 1 : 0;
    json->append("\", ");
    uint32_t at = reader.body;
    auto copy = [&](uint32_t end) {
        AppendLines(json, {text + at, end - at});
        at = end;
    };
    auto mend = [&](uint32_t end) {
        *mended += TextAppendJson(json, {text + at, end - at}) ? 1 : 0;
        at = end;
    };
    for (const TextPlace &place : reader.texts) {
        if (place.start < reader.body) {
            continue;  // the host
        }
        copy(place.start);
        if (place.split != 0) {
            mend(place.split);
            copy(at + static_cast<uint32_t>(kSwitch.size()));
        }
        mend(place.end);
    }
    copy(reader.at);
}

}  // namespace report
