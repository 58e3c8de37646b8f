#include "cli.h"

#include "analysis.h"
#include "annotate.h"
#include "inputs.h"
#include "meta_json.h"
#include "photo_io.h"
#include "progress.h"

#include <lumicor/calib.h>
#include <lumicor/ktsimilarity.h>
#include <lumicor/lmc.h>
#include <lumicor/vond.h>

#include <fcntl.h>
#include <unistd.h>

#include <CLI/CLI.hpp>

#include <algorithm>
#include <atomic>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <map>
#include <memory>
#include <new>
#include <string>
#include <thread>
#include <vector>

namespace lumicor_tool {

namespace {

constexpr int kExitOk = 0;
constexpr int kExitFailed = 1;
constexpr int kExitUsage = 2;

// Where the tool's own messages go: standard error as it was when the tool
// started (the library's diagnostics may be sent elsewhere, see below).
std::FILE* g_err = stderr;
bool g_errIsTerminal = false;

void Error(const std::string& line) {
    std::fflush(stdout);
    std::fprintf(g_err, "lumicor: %s\n", line.c_str());
    std::fflush(g_err);
}

// The attention and framing library prints developer diagnostics on
// standard error. The tool reports every failure itself in one line, so
// while it runs, file descriptor 2 goes to /dev/null and the tool writes to
// a copy of the original one (unless --verbose).
class LibraryDiagnostics {
public:
    explicit LibraryDiagnostics(bool show) {
        g_err = stderr;
        g_errIsTerminal = isatty(STDERR_FILENO) != 0;
        if (show) return;
        std::fflush(stderr);
        saved_ = dup(STDERR_FILENO);
        const int copy = saved_ >= 0 ? dup(saved_) : -1;
        std::FILE* err = copy >= 0 ? fdopen(copy, "w") : nullptr;
        const int null = open("/dev/null", O_WRONLY);
        if (err == nullptr || null < 0 || dup2(null, STDERR_FILENO) < 0) {
            if (err != nullptr) std::fclose(err);
            else if (copy >= 0) close(copy);
            if (null >= 0) close(null);
            if (saved_ >= 0) close(saved_);
            saved_ = -1;
            return;
        }
        close(null);
        g_err = err;
    }
    ~LibraryDiagnostics() {
        if (saved_ < 0) return;
        std::fclose(g_err);
        std::fflush(stderr);
        dup2(saved_, STDERR_FILENO);
        close(saved_);
        g_err = stderr;
    }
    LibraryDiagnostics(const LibraryDiagnostics&) = delete;
    LibraryDiagnostics& operator=(const LibraryDiagnostics&) = delete;

private:
    int saved_ = -1;
};

// Runs work(i) for i = 0 .. count-1 on `jobs` threads; every index runs once.
void RunParallel(size_t count, int jobs, const std::function<void(size_t)>& work) {
    const size_t threads = std::min<size_t>(count, static_cast<size_t>(std::max(1, jobs)));
    std::atomic<size_t> next(0);
    auto worker = [&] {
        for (size_t i = next++; i < count; i = next++) work(i);
    };
    std::vector<std::thread> pool;
    for (size_t t = 1; t < threads; ++t) pool.emplace_back(worker);
    worker();
    for (std::thread& t : pool) t.join();
}

// A photo decoded and analysed, or a stored meta read: its blob and parsed record.
struct Loaded {
    std::vector<uint8_t> blob;
    MetaRecord meta;
    Photo photo;  // empty for a meta file
};

// Reads `path` as a meta (when allowed) or a photo, analysing a photo.
bool Load(const std::string& path, bool allowMeta, bool detectFaces, Library* library, Loaded* out,
          std::string* error) {
    std::vector<uint8_t> bytes;
    if (!ReadFile(path, &bytes, error)) return false;
    const FileKind kind = SniffKind(bytes);
    if (kind == FileKind::kMeta) {
        if (!allowMeta) {
            *error = "a photo meta, not a photo";
            return false;
        }
        out->blob.swap(bytes);
        return out->meta.Parse(out->blob, error);
    }
    if (kind == FileKind::kUnknown) {
        *error = allowMeta ? "unsupported format (not JPEG, PNG or a photo meta)" : "unsupported format (not JPEG or PNG)";
        return false;
    }
    if (!DecodePhoto(bytes, &out->photo, error)) return false;
    bytes.clear();
    bytes.shrink_to_fit();
    if (!library->Analyze(out->photo.image.get(), detectFaces, &out->blob, error)) return false;
    return out->meta.Parse(out->blob, error);
}


// ------------------------------------------------------------------ analyze

struct AnalyzeOptions {
    std::vector<std::string> inputs;
    std::string outDir = ".";
    std::string faces = "auto";
    bool annotate = false;
    int jobs = 1;
};

int Analyze(const AnalyzeOptions& o, Library* library) {
    std::vector<std::string> errors;
    const std::vector<std::string> photos = ExpandInputs(o.inputs, false, &errors);
    for (const std::string& e : errors) Error(e);
    int status = errors.empty() ? kExitOk : kExitFailed;
    if (photos.empty()) return kExitFailed;

    // Two photos of the same name in different folders would overwrite each
    // other's results.
    std::map<std::string, std::string> byStem;
    for (const std::string& p : photos) {
        auto inserted = byStem.emplace(Stem(p), p);
        if (!inserted.second) {
            Error(p + " and " + inserted.first->second + " would both write " + Stem(p) +
                  ".lmeta; analyse them into different folders (-o)");
            return kExitUsage;
        }
    }
    std::error_code ec;
    std::filesystem::create_directories(o.outDir, ec);
    if (ec || !std::filesystem::is_directory(o.outDir, ec)) {
        Error(o.outDir + ": cannot create the output folder");
        return kExitFailed;
    }

    Progress progress(photos.size(), g_err, g_errIsTerminal);
    std::atomic<size_t> failed(0);
    const auto start = std::chrono::steady_clock::now();
    RunParallel(photos.size(), o.jobs, [&](size_t i) {
        const std::string& path = photos[i];
        std::string error;
        const std::string base = o.outDir + "/" + Stem(path);
        Loaded loaded;
        bool ok = Load(path, false, o.faces == "auto", library, &loaded, &error);
        if (ok) ok = WriteFile(base + ".lmeta", loaded.blob.data(), loaded.blob.size(), &error);
        if (ok) {
            nlohmann::ordered_json json = {{"photo", path},
                                           {"photoWidth", loaded.photo.Width()},
                                           {"photoHeight", loaded.photo.Height()},
                                           {"exifOrientation", loaded.photo.exifOrientation},
                                           {"blobBytes", loaded.blob.size()}};
            const nlohmann::ordered_json fields = MetaToJson(loaded.meta.get());
            for (const auto& item : fields.items()) json[item.key()] = item.value();
            const std::string text = json.dump(2, ' ', false, nlohmann::ordered_json::error_handler_t::replace) + "\n";
            ok = WriteFile(base + ".json", reinterpret_cast<const uint8_t*>(text.data()), text.size(), &error);
        }
        std::string outputs = base + ".lmeta " + base + ".json";
        if (ok && o.annotate) {
            ZbmImagePtr picture = Annotate(loaded.photo.image.get(), loaded.meta.get());
            if (!picture) {
                error = "out of memory while drawing the annotated picture";
                ok = false;
            } else {
                ok = WritePng(base + ".annotated.png", picture.get(), &error);
                outputs += " " + base + ".annotated.png";
            }
        }
        if (ok) {
            const _VondMeta& m = loaded.meta.get();
            const uint32_t faces = m.faceMeta.regionCount;
            char line[160];
            std::snprintf(line, sizeof line, "%dx%d, %u face%s, %u attention area%s", loaded.photo.Width(),
                          loaded.photo.Height(), faces, faces == 1 ? "" : "s", m.attentionAreas.numAreas,
                          m.attentionAreas.numAreas == 1 ? "" : "s");
            progress.Line(stdout, path + ": " + line + " -> " + outputs);
        } else {
            ++failed;
            progress.Line(g_err, "lumicor: " + path + ": " + error);
        }
        progress.Step();
    });
    if (photos.size() > 1) {
        const double seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
        char line[128];
        std::snprintf(line, sizeof line, "%zu of %zu photos analysed in %.1f s", photos.size() - failed.load(),
                      photos.size(), seconds);
        progress.Line(stdout, line);
    }
    return failed != 0 ? kExitFailed : status;
}

// ------------------------------------------------------------------ frame

struct FrameOptions {
    std::string input;
    std::string aspect;
    int mode = 4;
    float zoomLimit = 10.0f;
    std::string output;
    std::string photo;
    std::string faces = "auto";
};

// "W:H" with two positive numbers; the framing wants height / width.
bool ParseAspect(const std::string& text, float* ratio) {
    const size_t colon = text.find(':');
    if (colon == std::string::npos) return false;
    try {
        size_t used1 = 0, used2 = 0;
        const double w = std::stod(text.substr(0, colon), &used1);
        const double h = std::stod(text.substr(colon + 1), &used2);
        if (used1 != colon || used2 != text.size() - colon - 1 || !(w > 0) || !(h > 0) || !std::isfinite(w / h))
            return false;
        *ratio = static_cast<float>(h / w);
        return true;
    } catch (const std::exception&) {
        return false;
    }
}

int Frame(const FrameOptions& o, Library* library) {
    float aspect = 0;
    if (!ParseAspect(o.aspect, &aspect)) {
        Error("--aspect " + o.aspect + ": expected W:H with two positive numbers, e.g. 16:9");
        return kExitUsage;
    }
    std::string error;
    Loaded loaded;
    if (!Load(o.input, true, o.faces == "auto", library, &loaded, &error)) {
        Error(o.input + ": " + error);
        return kExitFailed;
    }
    const bool fromMeta = !loaded.photo.image;
    if (fromMeta && !o.photo.empty()) {
        std::vector<uint8_t> bytes;
        if (!ReadFile(o.photo, &bytes, &error) || !DecodePhoto(bytes, &loaded.photo, &error)) {
            Error(o.photo + ": " + error);
            return kExitFailed;
        }
        const _FaceMeta& f = loaded.meta.get().faceMeta;
        // The meta keeps the photo size in 16 bits.
        if ((loaded.photo.Width() & 0xFFFF) != f.imageWidth || (loaded.photo.Height() & 0xFFFF) != f.imageHeight) {
            Error(o.photo + ": is " + std::to_string(loaded.photo.Width()) + "x" + std::to_string(loaded.photo.Height()) +
                  " pixels, but the meta was made from a " + std::to_string(f.imageWidth) + "x" +
                  std::to_string(f.imageHeight) + " photo");
            return kExitFailed;
        }
    }
    if (!o.output.empty() && !loaded.photo.image) {
        Error("-o needs the photo's pixels: give the photo instead of its meta, or add --photo PHOTO");
        return kExitUsage;
    }

    const LmcPhotoMeta blob = {static_cast<uint32_t>(loaded.blob.size()), loaded.blob.data()};
    const LmcFramingParam param = {o.mode, aspect, o.zoomLimit};
    LmcRect crop;
    const uint32_t status = LmcSearchFraming(&blob, &param, &crop);
    if (status != LMC_STATUS_OK) {
        Error(o.input + ": no framing found (LmcSearchFraming status " + std::to_string(status) +
              "; the framing search needs an analysed photo of at least 240 pixels a side, --mode 0..4, "
              "an aspect within 1:10..10:1 and a zoom limit within 1..100)");
        return kExitFailed;
    }

    // Pixels of the photo: its own size, or the size the meta recorded.
    const _VondMeta& m = loaded.meta.get();
    int W = loaded.photo.Width(), H = loaded.photo.Height();
    if (!loaded.photo.image) {
        W = m.faceMeta.imageWidth != 0 ? m.faceMeta.imageWidth : m.analyzedWidth;
        H = m.faceMeta.imageHeight != 0 ? m.faceMeta.imageHeight : m.analyzedHeight;
    }
    auto clampTo = [](double v, int limit) { return static_cast<int>(std::lround(std::min(std::max(v, 0.0), double(limit)))); };
    const int x0 = clampTo(double(crop.x) * W, W), y0 = clampTo(double(crop.y) * H, H);
    const int x1 = clampTo(double(crop.x + crop.width) * W, W), y1 = clampTo(double(crop.y + crop.height) * H, H);
    std::printf("%s: crop %s (mode %d, zoom limit %g)\n", o.input.c_str(), o.aspect.c_str(), o.mode,
                static_cast<double>(o.zoomLimit));
    std::printf("  fractions: x=%.4f y=%.4f width=%.4f height=%.4f\n", static_cast<double>(crop.x),
                static_cast<double>(crop.y), static_cast<double>(crop.width), static_cast<double>(crop.height));
    std::printf("  pixels:    x=%d y=%d width=%d height=%d of %dx%d\n", x0, y0, x1 - x0, y1 - y0, W, H);

    if (!o.output.empty()) {
        const zbm_Rect rect = {x0, y0, x1 - x0, y1 - y0};
        ZbmImagePtr cropped(ZbiuCreateCrop(loaded.photo.image.get(), rect));
        if (!cropped) {
            Error(o.output + ": cannot cut the crop out of the photo");
            return kExitFailed;
        }
        if (!WritePng(o.output, cropped.get(), &error)) {
            Error(error);
            return kExitFailed;
        }
        std::printf("  written:   %s\n", o.output.c_str());
    }
    return kExitOk;
}

// ------------------------------------------------------------------ similar

struct SimilarOptions {
    std::vector<std::string> inputs;
    int jobs = 1;
    float threshold = KT_SIML_NEAR_DUPLICATE_THRESHOLD;
};

int Similar(const SimilarOptions& o, Library* library) {
    std::vector<std::string> errors;
    const std::vector<std::string> files = ExpandInputs(o.inputs, true, &errors);
    for (const std::string& e : errors) Error(e);
    if (!errors.empty() && files.size() < 2) return kExitFailed;
    if (files.size() < 2) {
        Error("similar needs at least two photos or metas (the first is the reference)");
        return kExitUsage;
    }
    // Only the similarity signature is compared, so photos are analysed
    // without faces.
    std::vector<std::unique_ptr<Loaded>> loaded(files.size());
    std::vector<std::string> failures(files.size());
    Progress progress(files.size(), g_err, g_errIsTerminal);
    RunParallel(files.size(), o.jobs, [&](size_t i) {
        std::unique_ptr<Loaded> item(new Loaded);
        std::string error;
        if (Load(files[i], true, false, library, item.get(), &error))
            loaded[i] = std::move(item);
        else
            failures[i] = error;
        progress.Step();
    });
    int status = errors.empty() ? kExitOk : kExitFailed;
    for (size_t i = 0; i < files.size(); ++i) {
        if (!loaded[i]) {
            progress.Line(g_err, "lumicor: " + files[i] + ": " + failures[i]);
            status = kExitFailed;
        }
    }
    if (!loaded[0]) {
        Error("the reference " + files[0] + " could not be read");
        return kExitFailed;
    }
    struct Row {
        float distance;
        int duplicate;
        size_t index;
    };
    std::vector<Row> rows;
    const _KtMetaSimilarity& reference = loaded[0]->meta.get().similarity;
    for (size_t i = 1; i < files.size(); ++i) {
        if (!loaded[i]) continue;
        const _KtMetaSimilarity& other = loaded[i]->meta.get().similarity;
        Row row = {0, 0, i};
        if (KtSimlDistance(&reference, &other, &row.distance) != KT_OK ||
            KtSimlIsNearDuplicate(&reference, &other, o.threshold, &row.duplicate) != KT_OK) {
            progress.Line(g_err, "lumicor: " + files[i] + ": cannot be compared");
            status = kExitFailed;
            continue;
        }
        rows.push_back(row);
    }
    std::stable_sort(rows.begin(), rows.end(), [](const Row& a, const Row& b) { return a.distance < b.distance; });
    std::printf("reference: %s\n", files[0].c_str());
    std::printf("rank  distance  photo\n");
    for (size_t r = 0; r < rows.size(); ++r) {
        std::printf("%4zu  %8.4f  %s%s\n", r + 1, static_cast<double>(rows[r].distance), files[rows[r].index].c_str(),
                    rows[r].duplicate ? "  (near-duplicate)" : "");
    }
    return status;
}

// ------------------------------------------------------------------ dump

int Dump(const std::string& path) {
    std::vector<uint8_t> bytes;
    std::string error;
    if (!ReadFile(path, &bytes, &error)) {
        Error(path + ": " + error);
        return kExitFailed;
    }
    const FileKind kind = SniffKind(bytes);
    if (kind == FileKind::kJpeg || kind == FileKind::kPng) {
        Error(path + ": a photo, not a photo meta (make one with lumicor analyze)");
        return kExitFailed;
    }
    MetaRecord meta;
    if (!meta.Parse(bytes, &error)) {
        Error(path + ": " + error);
        return kExitFailed;
    }
    VondDumpMeta(&meta.get());
    std::fflush(stdout);
    return kExitOk;
}

int Run(int argc, char** argv) {
    const _VondVersion* v = VondGetVersion();
    char version[96];
    std::snprintf(version, sizeof version, "lumicor (Vond %d.%d.%08x, meta version %d)", v->major, v->minor,
                  static_cast<unsigned>(v->build), v->metaVersion);

    CLI::App app("Analyses photos into Lumicor photo metas, frames, compares and prints them.", "lumicor");
    app.set_version_flag("--version", version);
    app.require_subcommand(1);
    bool verbose = false;
    app.add_flag("--verbose", verbose, "show the library's own diagnostics on standard error");
    std::string config;
    app.add_option("--config", config, "lmc.conf to start the library with (logging, debug images)")
        ->check(CLI::ExistingFile);
    const auto facesCheck = CLI::IsMember({"auto", "none"});

    AnalyzeOptions analyze;
    CLI::App* analyzeCmd = app.add_subcommand("analyze", "Analyse photos into NAME.lmeta and NAME.json");
    analyzeCmd->add_option("photos", analyze.inputs, "JPEG or PNG photos, or folders of them")->required();
    analyzeCmd->add_option("-o,--output", analyze.outDir, "output folder (created when missing)")->capture_default_str();
    analyzeCmd->add_option("--faces", analyze.faces, "detect faces (auto) or analyse without faces (none)")->capture_default_str()
        ->check(facesCheck);
    analyzeCmd->add_flag("--annotate", analyze.annotate,
                         "also write NAME.annotated.png with faces, attention areas and finger outlines");
    analyzeCmd->add_option("-j,--jobs", analyze.jobs, "photos worked on in parallel")->capture_default_str()->check(CLI::Range(1, 64));

    FrameOptions frame;
    CLI::App* frameCmd = app.add_subcommand("frame", "Find the best crop of a shape for a meta or a photo");
    frameCmd->add_option("input", frame.input, "a photo meta (.lmeta) or a photo (analysed first)")->required();
    frameCmd->add_option("--aspect", frame.aspect, "crop shape W:H, e.g. 16:9 or 1:1")->required();
    frameCmd->add_option("--mode", frame.mode,
                         "composition: 0 main subject on a power point, 1 two subjects together, 2 two subjects "
                         "on opposite power points, 3 subject centred, 4 all areas by importance")->capture_default_str()->check(CLI::Range(0, 4));
    frameCmd->add_option("--zoom-limit", frame.zoomLimit, "largest zoom the crop may imply (1..100)")->capture_default_str()
        ->check(CLI::Range(1.0, 100.0));
    frameCmd->add_option("-o,--output", frame.output, "write the cropped photo as PNG");
    frameCmd->add_option("--photo", frame.photo, "the photo of a meta input, for -o")->check(CLI::ExistingFile);
    frameCmd->add_option("--faces", frame.faces, "face detection when a photo is analysed (auto|none)")->capture_default_str()
        ->check(facesCheck);

    SimilarOptions similar;
    CLI::App* similarCmd =
        app.add_subcommand("similar", "Rank photos or metas by similarity to the first and mark near-duplicates");
    similarCmd->add_option("inputs", similar.inputs, "photos, metas or folders; the first file is the reference")
        ->required();
    similarCmd->add_option("-j,--jobs", similar.jobs, "photos analysed in parallel")->capture_default_str()->check(CLI::Range(1, 64));
    similarCmd->add_option("--threshold", similar.threshold, "near-duplicate distance")->capture_default_str()
        ->check(CLI::Range(0.0, 1.0));

    std::string dumpPath;
    CLI::App* dumpCmd = app.add_subcommand("dump", "Print a stored photo meta");
    dumpCmd->add_option("meta", dumpPath, "a photo meta (.lmeta)")->required();

    // A mistyped command would otherwise be reported as a missing one.
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (arg == "--config") {
            ++i;
            continue;
        }
        if (arg.empty() || arg[0] == '-') continue;
        if (arg != "analyze" && arg != "frame" && arg != "similar" && arg != "dump") {
            Error("unknown command '" + arg + "' (commands: analyze, frame, similar, dump; see lumicor --help)");
            return kExitUsage;
        }
        break;
    }
    try {
        app.parse(argc, argv);
    } catch (const CLI::CallForHelp& e) {
        return app.exit(e);
    } catch (const CLI::CallForAllHelp& e) {
        return app.exit(e);
    } catch (const CLI::CallForVersion& e) {
        return app.exit(e);
    } catch (const CLI::ParseError& e) {
        std::string what = e.what();
        std::replace(what.begin(), what.end(), '\n', ' ');
        Error(what + " (see lumicor --help)");
        return kExitUsage;
    }

    Library library(config);
    if (analyzeCmd->parsed()) return Analyze(analyze, &library);
    if (frameCmd->parsed()) return Frame(frame, &library);
    if (similarCmd->parsed()) return Similar(similar, &library);
    return Dump(dumpPath);
}

}  // namespace

int RunCommandLine(int argc, char** argv) {
    bool verbose = false;
    for (int i = 1; i < argc; ++i) verbose = verbose || std::string(argv[i]) == "--verbose";
    LibraryDiagnostics diagnostics(verbose);
    try {
        return Run(argc, argv);
    } catch (const std::bad_alloc&) {
        Error("out of memory");
    } catch (const std::exception& e) {
        Error(std::string("unexpected failure: ") + e.what());
    }
    return kExitFailed;
}

}  // namespace lumicor_tool
