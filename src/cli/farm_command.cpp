#include "cli/farm_command.h"

#include <fcntl.h>
#include <fmt/format.h>
#include <fmt/ranges.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <optional>
#include <thread>

#include "cli/document_input.h"
#include "cli/render_plan.h"
#include "render/offline_gl_renderer.h"
#include "scene/layer.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"

extern char** environ;

namespace cloudreel::cli {
namespace {

namespace fs = std::filesystem;

// Where the batch script, the tasks' logs and their exit statuses go,
// inside the output folder, which every task can reach.
constexpr const char* kFarmFolder = "cloudreel-farm";

int refuse(const std::string& message) {
  std::fprintf(stderr, "cloudreel farm: %s\n", message.c_str());
  return kRenderExitBadInput;
}

// One argument for bash: as it is when nothing in it is special to the
// shell, single-quoted otherwise.
std::string shellQuote(const std::string& text) {
  const bool plain = !text.empty() && text.find_first_not_of(
                                          "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz"
                                          "0123456789_./:=+-,@%") == std::string::npos;
  if (plain) {
    return text;
  }
  std::string quoted = "'";
  for (const char c : text) {
    quoted += c == '\'' ? std::string("'\\''") : std::string(1, c);
  }
  return quoted + "'";
}

std::optional<fs::path> findOnPath(const std::string& program) {
  const char* path = std::getenv("PATH");
  std::string_view rest = path != nullptr ? path : "";
  while (true) {
    const auto colon = rest.find(':');
    const fs::path folder(rest.substr(0, colon));
    if (!folder.empty() && access((folder / program).c_str(), X_OK) == 0) {
      return folder / program;
    }
    if (colon == std::string_view::npos) {
      return std::nullopt;
    }
    rest.remove_prefix(colon + 1);
  }
}

struct Ran {
  int status = -1;
  std::string output;
};

// Runs a program with its standard output and error collected.
Ran run(const fs::path& program, const std::vector<std::string>& args) {
  Ran ran;
  int pipeEnds[2];
  if (pipe(pipeEnds) != 0) {
    return ran;
  }
  std::vector<std::string> all{program.string()};
  all.insert(all.end(), args.begin(), args.end());
  std::vector<char*> argv;
  for (std::string& arg : all) {
    argv.push_back(arg.data());
  }
  argv.push_back(nullptr);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addclose(&actions, pipeEnds[0]);
  posix_spawn_file_actions_adddup2(&actions, pipeEnds[1], 1);
  posix_spawn_file_actions_adddup2(&actions, pipeEnds[1], 2);
  posix_spawn_file_actions_addclose(&actions, pipeEnds[1]);
  pid_t pid = 0;
  const int spawned = posix_spawn(&pid, argv[0], &actions, nullptr, argv.data(), environ);
  posix_spawn_file_actions_destroy(&actions);
  close(pipeEnds[1]);
  char buffer[4096];
  ssize_t n = 0;
  while ((n = read(pipeEnds[0], buffer, sizeof buffer)) > 0) {
    ran.output.append(buffer, static_cast<std::size_t>(n));
  }
  close(pipeEnds[0]);
  int waitStatus = 0;
  if (spawned == 0 && waitpid(pid, &waitStatus, 0) == pid && WIFEXITED(waitStatus)) {
    ran.status = WEXITSTATUS(waitStatus);
  }
  return ran;
}

std::string lastLine(const std::string& text) {
  std::string_view rest = text;
  while (!rest.empty() && (rest.back() == '\n' || rest.back() == '\r' || rest.back() == ' ')) {
    rest.remove_suffix(1);
  }
  const auto newline = rest.rfind('\n');
  return std::string(newline == std::string_view::npos ? rest : rest.substr(newline + 1));
}

std::string readText(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// The point files the document reads from disk when it opens: every linked
// point layer's, anywhere in the tree.
void linkedFiles(const std::vector<std::shared_ptr<Layer>>& layers, std::vector<fs::path>& out) {
  for (const auto& layer : layers) {
    if (const auto* points = dynamic_cast<const PointLayer*>(layer.get());
        points != nullptr && points->fileStoredAsLink()) {
      out.push_back(points->originalURL());
    }
    linkedFiles(layer->childLayers(), out);
  }
}

bool isUnder(const fs::path& path, const fs::path& root) {
  const fs::path relative = path.lexically_relative(root);
  return !relative.empty() && *relative.begin() != "..";
}

fs::path absoluteClean(const fs::path& path) {
  std::error_code ec;
  const fs::path absolute = fs::absolute(path, ec);
  return fs::weakly_canonical(ec ? path : absolute, ec).lexically_normal();
}

struct Chunk {
  int first;
  int last;
  std::string text() const { return fmt::format("{}-{}", first, last); }
};

// Consecutive frames in runs of at most `size`.
std::vector<Chunk> chunksOf(const std::vector<int>& frames, int size) {
  std::vector<Chunk> chunks;
  for (const int frame : frames) {
    if (!chunks.empty() && chunks.back().last + 1 == frame &&
        chunks.back().last - chunks.back().first + 1 < size) {
      chunks.back().last = frame;
    } else {
      chunks.push_back({frame, frame});
    }
  }
  return chunks;
}

bool frameIsThere(const RenderPlan& plan, const RenderCommandOptions& render,
                  const fs::path& folder, int frame) {
  for (const fs::path& file : OfflineGLRenderer::pathsForFrame(
           folder, plan.pattern, render.depth, render.stereoSeparation.has_value(), frame)) {
    if (!fs::is_regular_file(file)) {
      return false;
    }
  }
  return true;
}

// The render options a task passes on, as given.
std::vector<std::string> renderArguments(const RenderCommandOptions& render) {
  std::vector<std::string> args;
  if (!render.size.empty()) {
    args.insert(args.end(), {"--size", render.size});
  }
  if (render.depth) {
    args.emplace_back("--depth");
  }
  if (render.stereoSeparation) {
    args.insert(args.end(), {"--stereo", fmt::format("{}", *render.stereoSeparation)});
  }
  args.insert(args.end(), {"--pattern", render.pattern});
  if (render.rasterizer != "auto") {
    args.insert(args.end(), {"--rasterizer", render.rasterizer});
  }
  if (!render.cameraPath.empty()) {
    args.insert(args.end(), {"--camera-path", render.cameraPath});
  }
  return args;
}

std::string batchScript(const FarmOptions& options, const fs::path& program,
                        const fs::path& document, const fs::path& out,
                        const std::vector<Chunk>& chunks) {
  const fs::path farm = out / kFarmFolder;
  std::string script = "#!/bin/bash\n";
  script += fmt::format("#SBATCH --job-name=cloudreel-{}\n", document.stem().string());
  script += fmt::format("#SBATCH --array=0-{}\n", chunks.size() - 1);
  script += fmt::format("#SBATCH --output={}/%A_%a.log\n", farm.string());
  if (!options.partition.empty()) {
    script += fmt::format("#SBATCH --partition={}\n", options.partition);
  }
  if (!options.timeLimit.empty()) {
    script += fmt::format("#SBATCH --time={}\n", options.timeLimit);
  }
  for (const std::string& arg : options.sbatchArgs) {
    script += fmt::format("#SBATCH {}\n", arg);
  }
  script +=
      "\n# Each task renders one chunk of frames; --skip-existing lets a task that\n"
      "# is run again (requeued, or a resubmitted farm) keep what is already there.\n"
      "chunks=(";
  for (std::size_t i = 0; i < chunks.size(); ++i) {
    script += (i == 0 ? "" : " ") + chunks[i].text();
  }
  script += ")\n";
  std::string command = shellQuote(program.string()) + " render " + shellQuote(document.string()) +
                        " --out " + shellQuote(out.string()) +
                        " --frames \"${chunks[$SLURM_ARRAY_TASK_ID]}\" --skip-existing";
  for (const std::string& arg : renderArguments(options.render)) {
    command += " " + shellQuote(arg);
  }
  script += command + " --progress plain\n";
  script += "status=$?\n";
  // The task's own record of how it ended, read by `cloudreel farm --wait`
  // whether or not the cluster keeps accounting.
  script += fmt::format(
      "echo \"$status\" > {}/\"${{SLURM_ARRAY_JOB_ID}}_${{SLURM_ARRAY_TASK_ID}}.status\"\n",
      shellQuote(farm.string()));
  script += "exit \"$status\"\n";
  return script;
}

// Follows the job until no task is queued or running, showing frames as
// they appear; then answers the exit status from the tasks' records.
int waitForJob(const std::string& jobId, const fs::path& squeue, const FarmOptions& options,
               const RenderPlan& plan, const fs::path& out, const std::vector<Chunk>& chunks,
               int frameCount) {
  int shown = -1;
  const auto countDone = [&] {
    int done = 0;
    for (const Chunk& chunk : chunks) {
      for (int frame = chunk.first; frame <= chunk.last; ++frame) {
        done += frameIsThere(plan, options.render, out, frame) ? 1 : 0;
      }
    }
    return done;
  };
  while (true) {
    const Ran queue = run(squeue, {"-h", "-j", jobId, "-o", "%i %T"});
    const int done = countDone();
    if (done != shown) {
      std::fprintf(stderr, "job %s: %d of %d frames\n", jobId.c_str(), done, frameCount);
      shown = done;
    }
    // squeue forgets a finished job; it may also answer that the id is
    // unknown once the job has left the queue.
    const bool gone = queue.status != 0 || lastLine(queue.output).empty();
    if (gone) {
      break;
    }
    std::this_thread::sleep_for(std::chrono::seconds(1));
  }
  const fs::path farm = out / kFarmFolder;
  int failed = 0;
  for (std::size_t task = 0; task < chunks.size(); ++task) {
    const std::string name = fmt::format("{}_{}", jobId, task);
    const fs::path statusFile = farm / (name + ".status");
    const fs::path log = farm / (name + ".log");
    const std::string status = lastLine(readText(statusFile));
    if (status == "0") {
      continue;
    }
    ++failed;
    if (status.empty()) {
      std::fprintf(stderr,
                   "cloudreel farm: task %zu (frames %s) ended without finishing (cancelled, out "
                   "of time, or its node failed); its log: %s\n",
                   task, chunks[task].text().c_str(), log.c_str());
    } else {
      const std::string why = lastLine(readText(log));
      std::fprintf(stderr, "cloudreel farm: task %zu (frames %s) failed with status %s%s%s\n", task,
                   chunks[task].text().c_str(), status.c_str(), why.empty() ? "" : ": ",
                   why.c_str());
    }
  }
  const int done = countDone();
  std::fprintf(
      stderr, "job %s ended: %d of %d frames in %s%s\n", jobId.c_str(), done, frameCount,
      out.c_str(),
      failed > 0 ? fmt::format(", {} of {} tasks failed", failed, chunks.size()).c_str() : "");
  return failed > 0 || done < frameCount ? kRenderExitFramesNotWritten : kRenderExitOk;
}

}  // namespace

CLI::App* addFarmCommand(CLI::App& app, FarmOptions& options) {
  CLI::App* command = app.add_subcommand(
      "farm",
      "Render a document on a Slurm cluster: the frames split into chunks, one array job "
      "running `cloudreel render` on each chunk into the same folder.");
  command->add_option("DOC", options.render.document, "the .reel document to render")->required();
  command
      ->add_option("--out", options.render.outputFolder,
                   "the folder for the frames, reachable from the compute nodes")
      ->required();
  addRenderOptions(*command, options.render);
  command->add_option("--chunk", options.chunk, "frames a task renders")
      ->check(CLI::Range(1, 1'000'000))
      ->capture_default_str();
  command->add_option("--partition", options.partition, "the Slurm partition to run in");
  command->add_option("--time", options.timeLimit, "each task's time limit, as sbatch takes it");
  command->add_option("--sbatch-arg", options.sbatchArgs,
                      "another sbatch option for every task, e.g. --sbatch-arg=--gres=gpu:1 "
                      "(repeat for more)");
  command->add_option("--shared-root", options.sharedRoots,
                      "a folder the compute nodes share with this machine: the document, its "
                      "linked point files and the output folder must lie under one (repeat for "
                      "more)");
  command->add_option("--cloudreel", options.program,
                      "the cloudreel program the tasks run (default: this one, at its path here)");
  command->add_flag("--wait", options.wait,
                    "follow the job to its end, showing frames as they appear; exit non-zero "
                    "naming the chunks that failed");
  command->add_flag("--dry-run", options.dryRun, "print the batch script instead of submitting it");
  command->footer(
      "Exit status: 0 submitted (with --wait: every frame written); 1 bad input or no sbatch; "
      "2 (with --wait) some tasks failed, each named; 4 sbatch refused the job.");
  return command;
}

int runFarmCommand(const FarmOptions& options) {
  prepareForDocuments();
  MyDocument document;
  Error error;
  if (!readDocument(document, options.render.document, &error)) {
    return refuse(error.message);
  }
  std::string why;
  const std::optional<RenderPlan> plan = planRender(document, options.render, why);
  if (!plan) {
    return refuse(options.render.document + ": " + why);
  }
  const fs::path documentPath = absoluteClean(options.render.document);
  const fs::path out = absoluteClean(options.render.outputFolder);
  std::error_code ec;
  const fs::path program = options.program.empty() ? fs::read_symlink("/proc/self/exe", ec)
                                                   : absoluteClean(options.program);

  // The tasks read these on the compute nodes: they must lie where the
  // nodes see the same files.
  std::vector<std::pair<std::string, fs::path>> needed{{"the document", documentPath},
                                                       {"the output folder", out}};
  std::vector<fs::path> linked;
  linkedFiles(document.layers(), linked);
  for (const fs::path& file : linked) {
    needed.emplace_back("the linked point file", absoluteClean(file));
  }
  if (!options.sharedRoots.empty()) {
    for (const auto& [what, path] : needed) {
      bool shared = false;
      for (const std::string& root : options.sharedRoots) {
        shared = shared || isUnder(path, absoluteClean(root));
      }
      if (!shared) {
        return refuse(fmt::format(
            "{} {} is outside the shared folders ({}): the compute nodes could not read it", what,
            path.string(), fmt::join(options.sharedRoots, ", ")));
      }
    }
  }

  std::vector<int> frames;
  for (int frame = plan->range.firstFrame(); frame <= plan->range.last; ++frame) {
    if (!options.render.skipExisting || !frameIsThere(*plan, options.render, out, frame)) {
      frames.push_back(frame);
    }
  }
  if (frames.empty()) {
    std::fprintf(stderr, "All %d frames are already in %s: nothing to submit\n",
                 plan->range.frameCount(), out.c_str());
    return kRenderExitOk;
  }
  const std::vector<Chunk> chunks = chunksOf(frames, options.chunk);
  const std::string script = batchScript(options, program, documentPath, out, chunks);
  if (options.dryRun) {
    std::fputs(script.c_str(), stdout);
    return kRenderExitOk;
  }
  const auto sbatch = findOnPath("sbatch");
  const auto squeue = findOnPath("squeue");
  if (!sbatch || (options.wait && !squeue)) {
    return refuse(fmt::format(
        "{} not found on PATH: run this where jobs are submitted to your Slurm cluster (a login "
        "node), or install Slurm's client",
        sbatch ? "squeue" : "sbatch"));
  }
  const fs::path farm = out / kFarmFolder;
  fs::create_directories(farm, ec);
  if (!fs::is_directory(farm)) {
    return refuse("Cannot make the folder " + farm.string() + (ec ? ": " + ec.message() : ""));
  }
  const fs::path scriptPath =
      farm / fmt::format("{}-{}.sh", documentPath.stem().string(), std::time(nullptr));
  {
    std::ofstream file(scriptPath, std::ios::binary);
    file << script;
    if (!file.flush()) {
      return refuse("Cannot write " + scriptPath.string());
    }
  }
  const Ran submitted = run(*sbatch, {"--parsable", scriptPath.string()});
  const std::string reply = lastLine(submitted.output);
  const std::string jobId = reply.substr(0, reply.find(';'));
  if (submitted.status != 0 || jobId.empty() ||
      jobId.find_first_not_of("0123456789") != std::string::npos) {
    std::fprintf(stderr, "cloudreel farm: sbatch refused the job: %s\n",
                 lastLine(submitted.output).c_str());
    return kFarmExitSubmitFailed;
  }
  std::printf("%s\n", jobId.c_str());
  std::fflush(stdout);
  std::fprintf(stderr, "Submitted job %s: %zu frame%s in %zu task%s of up to %d into %s\n",
               jobId.c_str(), frames.size(), frames.size() == 1 ? "" : "s", chunks.size(),
               chunks.size() == 1 ? "" : "s", options.chunk, out.c_str());
  if (!options.wait) {
    return kRenderExitOk;
  }
  return waitForJob(jobId, *squeue, options, *plan, out, chunks, static_cast<int>(frames.size()));
}

}  // namespace cloudreel::cli
