// Converters of control flow (structured blocks from OSL jumps), of the ops that end or leave
// code, and of the ops the viewport ignores or cannot translate.
#include "op_converter_support.h"

namespace oslo {

namespace {

bool ConvertIf(OpConverterParams& p) {
    if (ArgCount(p) != 1 || p.instruction.jumps.size() != 2) return false;
    p.out << "if(" << Arg(p, 0) << ") {";
    ++p.depth;
    const int elseStart = p.instruction.jumps[0], end = p.instruction.jumps[1];
    p.blocks.push_back({BlockEvent::kEndIf, end, {}});
    if (elseStart != end) p.blocks.push_back({BlockEvent::kElse, elseStart, {}});
    return true;
}

// for, while and dowhile share one layout: condition code from jump 0, body from jump 1, step
// code from jump 2, loop end at jump 3.
OpConverter Loop(int startKind, int testKind, int endKind) {
    return [=](OpConverterParams& p) {
        if (ArgCount(p) != 1 || p.instruction.jumps.size() != 4) return false;
        const std::vector<int>& j = p.instruction.jumps;
        p.blocks.push_back({endKind, j[3], {}});
        p.blocks.push_back({testKind, j[1], Arg(p, 0)});
        p.blocks.push_back({startKind, j[0], {}});
        return true;
    };
}

OpConverter Text(const char* text) {
    return [text](OpConverterParams& p) {
        p.out << text;
        return true;
    };
}

OpConverter Unsupported(std::string op) {
    return [op](OpConverterParams& p) {
        // Ops whose first argument is an input (setmessage's name, for one) have no result.
        const OSOSymbol* result = ArgSymbol(p, 0);
        if (ArgCount(p) > 0 && !(result && result->symtype == kConst))
            p.out << Arg(p, 0) << " = 0;";
        RecordUnsupported(p.info, "'" + op + "' function not supported - ignored.");
        return true;
    };
}

} // namespace

void AddControlFlowConverters(std::map<std::string, OpConverter>& c) {
    c["if"] = ConvertIf;
    c["for"] = Loop(BlockEvent::kLoopStart, BlockEvent::kLoopTest, BlockEvent::kLoopEnd);
    c["while"] = Loop(BlockEvent::kLoopStart, BlockEvent::kLoopTest, BlockEvent::kLoopEnd);
    c["dowhile"] = Loop(BlockEvent::kDoLoopStart, BlockEvent::kDoLoopTest, BlockEvent::kDoLoopEnd);
    // A "return" only appears inside an inlined function, which the generator wraps in a one-pass
    // loop when it holds one; "break" leaves that loop.
    c["break"] = Text("break;");
    c["return"] = Text("break;");
    c["continue"] = [](OpConverterParams& p) {
        if (ArgCount(p) != 0) return false;
        p.out << "continue;";
        return true;
    };
    c["exit"] = Text("return;");
    for (const char* op : {"error", "warning", "printf", "end"}) c[op] = Text("");
    c["closure"] = [](OpConverterParams&) { return false; };
}

void AddUnsupportedConverters(std::map<std::string, OpConverter>& c) {
    for (const char* op : {"stof",
                           "stoi",
                           "startswith",
                           "split",
                           "texture3d",
                           "spline",
                           "splineinverse",
                           "trace",
                           "dict_find",
                           "dict_next",
                           "dict_value",
                           "regex_search",
                           "regex_match",
                           "pointcloud_search",
                           "pointcloud_get",
                           "pointcloud_write",
                           "setmessage",
                           "getmessage",
                           "isconnected",
                           "isconstant",
                           "or",
                           "and",
                           "clamp",
                           "degrees",
                           "radians",
                           "nop",
                           "normal"})
        c[op] = Unsupported(op);
}

} // namespace oslo
