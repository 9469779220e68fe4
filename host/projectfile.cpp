#include "host/projectfile.h"

#include "frame/errors.h"
#include "frame/frame.h"
#include "frame/services/chunkfile.h"
#include "frame/services/reports.h"
#include "host/expression.h"
#include "host/import.h"
#include "host/names.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <limits>
#include <optional>
#include <unordered_map>
#include <utility>

// A project file of this host:
//
//   LIST khsc
//     khti               units a second, whether the times are exact (4 bytes each), and the greatest error, a double
//   LIST kfgp            the tree
//   LIST khch            of each leaf that is animated, in the tree's order:
//     khin               how the source goes from key to key, 4 bytes
//     khco               the names of the components, a line each

namespace kfshost {

namespace {

constexpr int SceneListType = CKF_Id("khsc");
constexpr int TimesId = CKF_Id("khti");
constexpr int ChannelListType = CKF_Id("khch");
constexpr int InterpolationId = CKF_Id("khin");
constexpr int ComponentsId = CKF_Id("khco");

// ---- numbers in the file's byte order

template <std::size_t Size>
void PutWord(std::array<unsigned char, Size>& bytes, std::size_t offset, std::uint32_t word)
{
    for (std::size_t i = 0; i < 4; ++i) bytes[offset + i] = static_cast<unsigned char>(word >> (24 - 8 * i));
}

template <std::size_t Size>
std::uint32_t GetWord(std::array<unsigned char, Size> const& bytes, std::size_t offset)
{
    std::uint32_t word = 0;
    for (std::size_t i = 0; i < 4; ++i) word = word << 8 | bytes[offset + i];
    return word;
}

void ThrowCode(int code)
{
    if (code != 0) throw int{code};
}

// ---- going through a tree

struct Channel {
    AnimationGroup& animation;
    NodeGroup& node;
    StreamKind kind;
};

// Hands each animated leaf to `visit`, in the order of the tree. The layouts let nothing else into these groups.
template <class Visit>
void ForEachChannel(SceneGroup const& tree, Visit const& visit)
{
    auto& scene = const_cast<SceneGroup&>(tree);
    for (unsigned int i = 0; i < scene.GetNumStreams(); ++i) {
        auto& animation = dynamic_cast<AnimationGroup&>(*scene.GetEditableStream(i));
        for (unsigned int j = 0; j < animation.GetNumStreams(); ++j) {
            auto& node = dynamic_cast<NodeGroup&>(*animation.GetEditableStream(j));
            for (StreamKind const kind : AllStreamKinds)
                if (node.FindChannel(kind)) visit(Channel{animation, node, kind});
        }
    }
}

KFS_Stream const& StreamOf(Channel const& channel)
{
    return *channel.node.FindChannel(channel.kind);
}

std::string Sentence(Channel const& channel, std::string const& end)
{
    return DisplayNameOf(channel.animation) + '/' + DisplayNameOf(channel.node) + '/' +
           std::string(NameOf(channel.kind)) + ' ' + end;
}

// While it lives a stream answers what is stored in its keys. What follows from them, such as the length of a path, may be
// beyond all numbers, which is no fault of the file and shows when the stream is read.
class ScStoredOnly {
public:
    explicit ScStoredOnly(KFS_Stream const& stream) : stream_(const_cast<KFS_Stream&>(stream))
    {
        stream_.SetDisabledUpdateStream(true);
    }
    ~ScStoredOnly() { stream_.SetDisabledUpdateStream(false); }
    ScStoredOnly(ScStoredOnly const&) = delete;
    ScStoredOnly& operator=(ScStoredOnly const&) = delete;

private:
    KFS_Stream& stream_;
};

// What is wrong with the keys; nothing where they are in order. Throws StoreError.
std::string FaultOfKeys(KFS_Stream const& stream)
{
    ScStoredOnly const stored(stream);
    std::vector<double> numbers(static_cast<std::size_t>(stream.GetDimension()));
    T_Time before{};
    for (int i = 0; i < stream.GetKeyCount(); ++i) {
        T_Time time{};
        ThrowIfFailed(KFS_IndexToTime(&stream, i, &time));
        if (i > 0 && time.value <= before.value) return "has keys that aren't in the order of their times";
        before = time;
        ThrowIfFailed(KFS_GetKeyF(&stream, i, numbers.data(), nullptr, nullptr));
        if (!std::ranges::all_of(numbers, [](double number) { return std::isfinite(number); }))
            return "has a key without a finite value";
    }
    return "";
}

// Why a stream can't stand in a project whose scene has that scale. A project that has one is neither saved nor loaded.
std::string FaultOf(KFS_Stream const& stream, unsigned int timeScale)
{
    if (stream.GetValueDesc()->isCustom || stream.GetDimension() < 1) return "isn't made of numbers";
    if (stream.IsSpatial() && (stream.GetDimension() < 2 || stream.GetDimension() > 3))
        return "is a path in " + std::to_string(stream.GetDimension()) + " dimensions";
    if (stream.GetTimeScale() != timeScale) return "isn't in the times of its scene";
    if (stream.AreDimensionsSeparated() && !stream.IsSeparationLeader()) return "is separated, which it can't be";
    // A reader makes a constant of a stream that may not move, and needs its first key's value for that.
    if (stream.HasKeys() && stream.GetKeyCount() == 0 && !stream.CanBeAnimated())
        return "may not move, and has no value to stand at";
    return FaultOfKeys(stream);
}

// The same of a channel and its followers, whether or not they count at the moment.
std::string FaultOf(Channel const& channel, unsigned int timeScale)
{
    std::string fault = FaultOf(StreamOf(channel), timeScale);
    for (int d = 0; d < StreamOf(channel).GetDimension() && fault.empty(); ++d)
        if (KFS_Stream const* const follower = channel.node.FindFollower(channel.kind, d))
            fault = FaultOf(*follower, timeScale);
    return fault;
}

// What is known of a channel, and the usual names for the components of one that an edit has made and nobody described.
ChannelFacts DescriptionOf(Channel const& channel)
{
    ChannelFacts facts = channel.node.FactsOf(channel.kind);
    auto const dimension = static_cast<std::size_t>(StreamOf(channel).GetDimension());
    if (facts.components.size() != dimension) facts.components = UsualComponents(channel.kind, dimension);
    return facts;
}

// A read of a separated stream makes its followers real where they aren't, which reads in other threads mustn't.
void MakeFollowersReal(KFS_Stream const& stream)
{
    std::vector<KFS_Stream const*> followers;
    if (stream.AreDimensionsSeparated()) stream.GetSeparationFollowers(followers);
}

// A tree without expressions is spared the look at all of its keys.
void PrepareUsedExpressions(SceneGroup& tree)
{
    bool anyUsed = false;
    ForEachChannel(tree, [&anyUsed](Channel const& channel) {
        for (KFS_Stream const* mover : MoversOf(StreamOf(channel))) anyUsed = anyUsed || mover->HasExpression();
    });
    if (anyUsed) PrepareExpressions(tree);
}

// ---- writing

void WriteTimes(CKF_File* file, SceneGroup::Times const& times)
{
    CKF_ScWriteList const list(file, SceneListType, 0);
    std::array<unsigned char, 16> bytes{};
    PutWord(bytes, 0, times.scale);
    PutWord(bytes, 4, times.exact ? 1 : 0);
    auto const error = std::bit_cast<std::uint64_t>(times.worstError);
    PutWord(bytes, 8, static_cast<std::uint32_t>(error >> 32));
    PutWord(bytes, 12, static_cast<std::uint32_t>(error));
    ThrowCode(CKF_WriteAtom(file, TimesId, static_cast<int>(bytes.size()), bytes.data()));
}

void WriteFacts(CKF_File* file, ChannelFacts const& facts)
{
    CKF_ScWriteList const list(file, ChannelListType, 0);
    std::array<unsigned char, 4> interpolation{};
    PutWord(interpolation, 0, static_cast<std::uint32_t>(facts.interpolation));
    ThrowCode(CKF_WriteAtom(file, InterpolationId, 4, interpolation.data()));
    std::string lines = CleanName(facts.components.front());
    for (std::size_t i = 1; i < facts.components.size(); ++i) lines += '\n' + CleanName(facts.components[i]);
    ThrowCode(CKF_WriteString(file, ComponentsId, Q_MBToUTF16String(lines), 0));
}

void WriteProject(CKF_File* file, SceneGroup const& tree)
{
    // Before the tree: a follower that is asked for its default makes its leader real, which then isn't in the file.
    std::vector<ChannelFacts> facts;
    ForEachChannel(tree, [&facts](Channel const& channel) { facts.push_back(DescriptionOf(channel)); });
    WriteTimes(file, tree.times);
    tree.Write(file);
    for (ChannelFacts const& one : facts) WriteFacts(file, one);
}

void CheckTree(SceneGroup const& tree, std::string const& fileName)
{
    ForEachChannel(
        tree,
        [&](Channel const& channel) {
            if (std::string const fault = FaultOf(channel, tree.times.scale); !fault.empty())
                throw ProjectError(fileName, "can't be saved: " + Sentence(channel, fault));
        });
}

// All of a file that was just created, with the code that this gave.
void SaveInto(CKF_File& file, int created, SceneGroup const& tree, std::string const& fileName)
{
    auto const check = [&](int code) {
        if (code != 0) {
            std::string const text = file.LastErrorText();
            throw ProjectError(fileName, "can't be saved: " + (text.empty() ? StoreError(code).what() : text));
        }
    };
    check(created);
    try {
        CheckTree(tree, fileName);
        WriteProject(&file, tree);
    } catch (int code) {
        check(code);
    } catch (StoreError const& error) {
        throw ProjectError(fileName, "can't be saved: " + std::string(error.what()));
    }
    check(file.Commit());
}

// ---- reading

// Takes the reports for its scope.
class ScTakeReports {
public:
    explicit ScTakeReports(LoadNotes* notes) : notes_(notes)
    {
        if (!notes_) return;
        previous_ = Q_SetReportSink([this](Q_Report const& report) {
            notes_->reports.push_back(report.text ? CleanName(report.text) : "error " + std::to_string(report.code));
        });
    }
    ~ScTakeReports()
    {
        if (notes_) Q_SetReportSink(previous_);
    }
    ScTakeReports(ScTakeReports const&) = delete;
    ScTakeReports& operator=(ScTakeReports const&) = delete;

private:
    LoadNotes* notes_;
    Q_ReportSink previous_;
};

class ProjectReader {
public:
    ProjectReader(std::string const& fileName, LoadNotes* notes) : fileName_(fileName), notes_(notes), taken_(notes) {}

    // `source` is what CKF_File opens: a path, or bytes.
    template <class Source>
    std::unique_ptr<SceneGroup> Run(Source source)
    {
        if (int const code = file_.Open(source)) Fail(code);
        CheckVersion();
        tree_ = std::make_unique<SceneGroup>(Get_VX_StreamFactory());
        try {
            ReadTimes();
            tree_->Read(&file_, nullptr);
        } catch (int code) {
            Fail(code);
        }
        ForEachChannel(*tree_, [this](Channel const& channel) { CheckChannel(channel); });
        PrepareUsedExpressions(*tree_);
        return std::move(tree_);
    }

private:
    [[noreturn]] void Fail(int code) const
    {
        std::string const text = file_.LastErrorText();
        throw ProjectError(fileName_, text.empty() ? "damaged: " + Reason(code) : text);
    }

    // The sentence that was reported says more than a code.
    std::string Reason(int code) const
    {
        if (notes_ && !notes_->reports.empty()) return notes_->reports.back();
        switch (code) {
        case CKF_Err_NoSuchChunk: return "something is missing that files of its version have";
        case KFS_Err_BadFileInfo: return "a stream has a form that this program doesn't know";
        default: return StoreError(code).what();
        }
    }

    // Older files are read as their version says. What a newer one says, this program may not understand, and it would
    // lose that in the next save.
    void CheckVersion() const
    {
        auto const text = [](int major, int minor) { return std::to_string(major) + '.' + std::to_string(minor); };
        if (std::pair(file_.majorVersion, file_.minorVersion) >
            std::pair(CKF_CurrentMajorVersion, CKF_CurrentMinorVersion)) {
            throw ProjectError(fileName_, "a project of version " + text(file_.majorVersion, file_.minorVersion) +
                                              ", which is newer than this program's " +
                                              text(CKF_CurrentMajorVersion, CKF_CurrentMinorVersion));
        }
    }

    void ReadTimes()
    {
        bool found = false;
        CKF_ScDescendList const list(&file_, SceneListType, nullptr, &found);
        if (!found) throw ProjectError(fileName_, "a project, but not one with a scene of this program");
        std::array<unsigned char, 16> bytes{};
        ThrowCode(CKF_ReadAtom(&file_, TimesId, list.GetChunkInfo(), static_cast<int>(bytes.size()), bytes.data()));
        SceneGroup::Times& times = tree_->times;
        times.scale = GetWord(bytes, 0);
        times.exact = GetWord(bytes, 4) != 0;
        times.worstError =
            std::bit_cast<double>(static_cast<std::uint64_t>(GetWord(bytes, 8)) << 32 | GetWord(bytes, 12));
        if (times.scale == 0 || times.scale > static_cast<unsigned int>(std::numeric_limits<int>::max()) ||
            !(times.worstError >= 0.0))
            throw ProjectError(fileName_, "damaged: the scene has times in 1/" + std::to_string(times.scale) + " s");
    }

    void CheckChannel(Channel const& channel)
    {
        KFS_Stream const& stream = StreamOf(channel);
        try {
            if (std::string const fault = FaultOf(channel, tree_->times.scale); !fault.empty()) FailIn(channel, fault);
            MakeFollowersReal(stream);
            channel.node.SetFacts(channel.kind, ReadFacts(channel, static_cast<std::size_t>(stream.GetDimension())));
        } catch (int code) {
            Fail(code);
        } catch (StoreError const& error) {
            FailIn(channel, error.what());
        }
    }

    [[noreturn]] void FailIn(Channel const& channel, std::string const& what) const
    {
        throw ProjectError(fileName_, "damaged: " + Sentence(channel, what));
    }

    ChannelFacts ReadFacts(Channel const& channel, std::size_t dimension)
    {
        bool found = false;
        CKF_ScDescendList const list(&file_, ChannelListType, nullptr, &found);
        if (!found) FailIn(channel, "isn't described");
        std::array<unsigned char, 4> interpolation{};
        ThrowCode(CKF_ReadAtom(&file_, InterpolationId, list.GetChunkInfo(), 4, interpolation.data()));
        u16str lines;
        CKF_ReadString(&file_, list.GetChunkInfo(), ComponentsId, &lines, u16str(), 0);
        ChannelFacts facts;
        facts.interpolation = static_cast<SourceInterpolation>(GetWord(interpolation, 0));
        std::string const text = Q_UTF16ToMBString(lines);
        bool const isKnown = !NameOf(facts.interpolation).empty();
        if (!isKnown || static_cast<std::size_t>(std::ranges::count(text, '\n')) + 1 != dimension)
            FailIn(channel, "is described as something else");
        for (std::size_t begin = 0; begin <= text.size();) {
            std::size_t const end = std::min(text.find('\n', begin), text.size());
            facts.components.push_back(CleanName(std::string_view(text).substr(begin, end - begin)));
            begin = end + 1;
        }
        return facts;
    }

    std::string fileName_;
    LoadNotes* notes_;
    ScTakeReports taken_;
    CKF_File file_;
    std::unique_ptr<SceneGroup> tree_;
};

// ---- between a scene and its tree

// Finds the group that an item belongs to. A file may have several nodes of one name: the n-th leaf of a kind goes to
// the n-th of them, so that the order of the paths stays.
class AnimationBuilder {
public:
    AnimationBuilder(SceneGroup& tree, std::string const& name) : name_(name), group_(tree.AppendAnimation(name)) {}

    std::string const& Name() const { return name_; }

    NodeGroup& NodeFor(StreamItem const& item)
    {
        std::vector<NodeGroup*>& nodes = nodes_[item.node];
        std::size_t const index = leaves_[PathOf(item)]++;
        if (index == nodes.size()) nodes.push_back(&group_.AppendNode(item.node));
        return *nodes[index];
    }

private:
    std::string name_;
    AnimationGroup& group_;
    std::unordered_map<std::string, std::vector<NodeGroup*>> nodes_;
    std::unordered_map<std::string, std::size_t> leaves_;
};

// Hands the streams of a tree to `visit` as the items of its scene, followers behind their leader.
template <class Visit>
void ForEachItem(SceneGroup const& tree, Visit const& visit)
{
    UniqueNames paths;
    ForEachChannel(tree, [&](Channel const& channel) {
        ChannelFacts const facts = DescriptionOf(channel);
        auto const add = [&](KFS_Stream const* stream, int component) {
            StreamItem item;
            item.animation = DisplayNameOf(channel.animation);
            item.node = DisplayNameOf(channel.node);
            item.kind = channel.kind;
            item.interpolation = facts.interpolation;
            item.component = component;
            item.components = facts.components;
            if (IsFollower(item)) item.components = {facts.components[static_cast<std::size_t>(component)]};
            item.path = paths.Make(PathOf(item));
            item.place = item.path;
            item.stream = StreamPtr(const_cast<KFS_Stream*>(stream), StreamDeleter(false));
            visit(std::move(item));
        };
        KFS_Stream const& stream = StreamOf(channel);
        add(&stream, StreamItem::WholeValue);
        if (!IsSeparated(stream)) return;
        int component = 0;
        for (KFS_Stream const* const follower : MoversOf(stream)) add(follower, component++);
    });
}

// A stream as its holder's own. One that has a place in a tree leaves it.
std::unique_ptr<KFS_Stream> TakeOut(StreamPtr stream)
{
    bool const isOwner = stream.get_deleter().isOwner;
    KFS_Stream* const taken = stream.release();
    if (isOwner) return std::unique_ptr<KFS_Stream>(taken);
    KFS_StreamBase* const left = taken->GetParent()->GetAsNamedGroup()->SwapCanonicalForStream(taken->GetMatchName());
    return std::unique_ptr<KFS_Stream>(left->GetAsLeaf());
}

}  // namespace

std::unique_ptr<SceneGroup> MakeTree(Scene scene)
{
    auto tree = std::make_unique<SceneGroup>(Get_VX_StreamFactory());
    tree->SetDisplayName(Q_MBToUTF16String(scene.name));
    tree->times = {scene.timeScale, scene.exactTimes, scene.worstTimeError};
    std::optional<AnimationBuilder> animation;
    NodeGroup* node = nullptr;
    bool isSeparated = false;
    for (StreamItem& item : scene.streams) {
        if (IsFollower(item)) {  // behind its leader; of no use to one that has been joined meanwhile
            if (isSeparated) node->PutFollower(TakeOut(std::move(item.stream)));
            continue;
        }
        isSeparated = item.stream->AreDimensionsSeparated();
        if (!animation || animation->Name() != item.animation) animation.emplace(*tree, item.animation);
        node = &animation->NodeFor(item);
        node->PutChannel(item.kind, TakeOut(std::move(item.stream)));
        node->SetFacts(item.kind, {item.interpolation, std::move(item.components)});
    }
    PrepareUsedExpressions(*tree);
    return tree;
}

Scene TakeScene(std::unique_ptr<SceneGroup> tree)
{
    Scene scene;
    scene.name = DisplayNameOf(*tree);
    scene.timeScale = tree->times.scale;
    scene.exactTimes = tree->times.exact;
    scene.worstTimeError = tree->times.worstError;
    ForEachItem(*tree, [&scene](StreamItem item) { scene.streams.push_back(std::move(item)); });
    scene.tree = std::move(tree);
    return scene;
}

std::vector<ListedStream> ListStreams(SceneGroup const& tree)
{
    std::vector<ListedStream> streams;
    ForEachItem(tree, [&streams](StreamItem item) { streams.push_back({item.path, item.stream.get()}); });
    return streams;
}

void SaveProject(SceneGroup const& tree, std::string const& fileName, CKF_IoHook* hook)
{
    CKF_File file;
    SaveInto(file, file.Create(fileName.c_str(), hook), tree, fileName);
}

std::vector<unsigned char> SaveProjectToMemory(SceneGroup const& tree, std::string const& name)
{
    CKF_File file;
    SaveInto(file, file.CreateInMemory(), tree, name);
    return {file.GetBytes().begin(), file.GetBytes().end()};
}

std::unique_ptr<SceneGroup> LoadProject(std::string const& fileName, LoadNotes* notes)
{
    return ProjectReader(fileName, notes).Run(fileName.c_str());
}

std::unique_ptr<SceneGroup> LoadProject(FileInput const& input, LoadNotes* notes)
{
    auto const* const bytes = reinterpret_cast<unsigned char const*>(input.bytes.data());
    return LoadProjectFromMemory({bytes, input.bytes.size()}, ShownFileName(input.name), notes);
}

std::unique_ptr<SceneGroup> LoadProjectFromMemory(std::span<unsigned char const> bytes, std::string const& name,
                                                  LoadNotes* notes)
{
    return ProjectReader(name, notes).Run(bytes);
}

}  // namespace kfshost
