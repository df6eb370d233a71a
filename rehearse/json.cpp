// SPDX-License-Identifier: MIT
#include "json.h"

#include "bar.h"
#include "inventory.h"
#include "outcome.h"
#include "run.h"
#include "text.h"
#include "warnings.h"

#include <cstdint>
#include <cstdio>
#include <string>
#include <sys/wait.h>
#include <vector>

namespace
{

constexpr std::uint64_t SECTOR_SIZE = 512;

std::string Number(std::uint64_t number)
{
    return Format("%llu", static_cast<unsigned long long>(number));
}

std::string Bool(bool fTrue)
{
    return fTrue ? "true" : "false";
}

// "NAME": VALUE, with a value that is JSON already.
std::string Field(const char *szName, const std::string &szValue)
{
    return JsonQuoted(szName) + ": " + szValue;
}

std::string Object(const WORDS &fields)
{
    return "{" + Join(fields, ", ") + "}";
}

std::string List(const WORDS &values)
{
    return "[" + Join(values, ", ") + "]";
}

std::string Strings(const WORDS &words)
{
    WORDS quoted;
    for (const std::string &szWord : words) {
        quoted.push_back(JsonQuoted(szWord));
    }
    return List(quoted);
}

std::string Signatures(const DEVICE &device)
{
    WORDS values;
    for (const SIGNATURE &signature : device.signatures) {
        values.push_back(Object({Field("type", JsonQuoted(signature.szType)),
                                 Field("label", JsonQuoted(signature.szLabel))}));
    }
    return List(values);
}

std::string PartitionObject(const PARTITION &partition)
{
    const DEVICE &device = partition.device;
    return Object({Field("path", JsonQuoted(device.szPath)),
                   Field("number", Number(static_cast<std::uint64_t>(partition.number))),
                   Field("start", Number(partition.start)),
                   Field("sectors", Number(device.nSector)),
                   Field("signatures", Signatures(device)),
                   Field("array", JsonQuoted(device.superblock.szMd)),
                   Field("array_uuid", JsonQuoted(device.superblock.szUuid)),
                   Field("holders", Strings(device.holders)),
                   Field("mounts", Strings(device.mounts)), Field("swap", Bool(device.fSwap))});
}

std::string PieceObject(const PIECE &piece)
{
    return Object({Field("number", Number(static_cast<std::uint64_t>(piece.number))),
                   Field("start", Number(piece.start)), Field("sectors", Number(piece.nSector)),
                   Field("kept", Bool(piece.fKept))});
}

std::string DiskObject(const DISK_OUTCOME &outcome)
{
    const DISK &disk = *outcome.pDisk;
    WORDS before;
    WORDS after;
    for (const PARTITION &partition : disk.partitions) {
        before.push_back(PartitionObject(partition));
    }
    for (const PIECE &piece : outcome.after) {
        after.push_back(PieceObject(piece));
    }
    return Object({Field("path", JsonQuoted(disk.device.szPath)),
                   Field("bytes", Number(disk.device.nSector * SECTOR_SIZE)),
                   Field("model", JsonQuoted(disk.szModel)),
                   Field("serial", JsonQuoted(disk.szSerial)),
                   Field("layout", JsonQuoted(LayoutVersionText(disk))),
                   Field("signatures", Signatures(disk.device)),
                   Field("fate", JsonQuoted(FateText(outcome.fate))),
                   Field("partitions", List(before)), Field("partitions_after", List(after))});
}

std::string DisksList(const SCENE &scene)
{
    WORDS values;
    for (const DISK_OUTCOME &outcome : scene.outcome.disks) {
        values.push_back(DiskObject(outcome));
    }
    return List(values);
}

std::string LossesList(const SCENE &scene)
{
    WORDS values;
    for (const LOSS &loss : scene.outcome.losses) {
        values.push_back(Object(
            {Field("what", JsonQuoted(loss.szText)), Field("mounts", Strings(loss.mounts))}));
    }
    return List(values);
}

std::string WarningsList(const std::vector<WARNING> &warnings)
{
    WORDS values;
    for (const WARNING &warning : warnings) {
        values.push_back(Object({Field("kind", JsonQuoted(warning.szKind)),
                                 Field("text", JsonQuoted(warning.szText))}));
    }
    return List(values);
}

std::string CommandsList(const RUN &run, bool fQuestions)
{
    WORDS values;
    for (const COMMAND &command : run.commands) {
        if (command.fQuestion == fQuestions) {
            values.push_back(
                Object({Field("argv", Strings(command.argv)),
                        Field("process", Number(static_cast<std::uint64_t>(command.parent)))}));
        }
    }
    return List(values);
}

std::string LogList(const RUN &run)
{
    WORDS values;
    for (const LOG_LINE &line : run.log) {
        values.push_back(
            Object({Field("priority", Number(static_cast<std::uint64_t>(line.priority))),
                    Field("text", JsonQuoted(line.szText))}));
    }
    return List(values);
}

} // namespace

void JsonPrint(const SCENE &scene, const std::vector<WARNING> &warnings)
{
    const RUN &run = scene.run;
    const WORDS fields = {
        Field("command", Strings(scene.options.words)),
        Field("disks", DisksList(scene)),
        Field("losses", LossesList(scene)),
        Field("warnings", WarningsList(warnings)),
        Field("commands", CommandsList(run, false)),
        Field("questions", CommandsList(run, true)),
        Field("output", JsonQuoted(run.szOut)),
        Field("errors", JsonQuoted(run.szErr)),
        Field("log", LogList(run)),
        Field("status", WIFEXITED(run.status)
                            ? Number(static_cast<std::uint64_t>(WEXITSTATUS(run.status)))
                            : "null"),
    };
    (void)printf("{%s}\n", Join(fields, ",\n ").c_str());
}
