// Runs the scripts of fourslash cases with a helper that notes what each verification expects.
//
// In: JSON on standard input, a list of {name, script, files, markers, ranges} as fourslash.py parses them. Out: JSON, for
// each case {name, calls: [{verb, expected: {marker: ...}, filter}], opened: [path]} or {name, error}. A script is TypeScript, whose types
// node itself strips.
'use strict';
const { stripTypeScriptTypes } = require('node:module');
const vm = require('node:vm');

function helperOf(test, calls, opened) {
    const starts = new Map(
        test.files.map((file) => {
            const offsets = [0];
            for (let at = file.text.indexOf('\n'); at >= 0; at = file.text.indexOf('\n', at + 1)) offsets.push(at + 1);
            return [file.path, offsets];
        })
    );
    const texts = new Map(test.files.map((file) => [file.path, file.text]));
    const position = (path, offset) => {
        const offsets = starts.get(path);
        let line = offsets.length - 1;
        while (offsets[line] > offset) line--;
        return { line, character: offset - offsets[line] };
    };
    const markers = test.markers.map(({ name, fileName, position: at, data }) => ({
        fileName,
        fileUri: fileName,
        position: at,
        data,
        _name: name,
    }));
    const ranges = test.ranges.map(({ fileName, pos, end, marker }) => ({
        fileName,
        fileUri: fileName,
        pos,
        end,
        marker: marker === null ? undefined : markers[marker],
    }));
    const text = (range) => texts.get(range.fileName).slice(range.pos, range.end);
    const marker = (name) => {
        const found = markers.find((each) => each._name === name);
        if (!found) throw new Error(`no marker ${name}`);
        return found;
    };
    const positionRange = (range) => ({
        start: position(range.fileName, range.pos),
        end: position(range.fileName, range.end),
    });
    const known = {
        getMarkers: () => markers.slice(),
        getMarkerName: (each) => each._name,
        getMarkerByName: marker,
        getMarkerNames: () => markers.map((each) => each._name).filter((name) => name !== null),
        getRanges: () => ranges.slice(),
        getRangesInFile: (path) => ranges.filter((range) => range.fileName === path),
        getRangesByText: () => {
            const found = new Map();
            for (const range of ranges) {
                if (!found.has(text(range))) found.set(text(range), []);
                found.get(text(range)).push(range);
            }
            return found;
        },
        getFilteredRanges: (wanted) =>
            ranges.filter((range) => wanted(range.marker, range.marker ? range.marker.data : undefined, text(range))),
        openFile: (path) => void opened.push(path),
        openFiles: (paths) => void opened.push(...paths),
        getMappedFilePath: (path) => path,
        getDirectoryPath: (path) => path.slice(0, path.lastIndexOf('/')),
        getPathSep: () => '/',
        convertPositionRange: positionRange,
        convertPathToUri: (path) => path,
        expandPositionRange: (range, before, behind) => ({
            start: { line: range.start.line, character: range.start.character - before },
            end: { line: range.end.line, character: range.end.character + behind },
        }),
        getPosition: (name) => position(marker(name).fileName, marker(name).position),
        getPositionRange: (name) => {
            const found = ranges.find((range) => range.marker && range.marker._name === name);
            if (!found) throw new Error(`no range at ${name}`);
            return positionRange(found);
        },
    };
    return new Proxy(known, {
        get(target, verb) {
            if (verb in target) return target[verb];
            if (typeof verb === 'string' && verb.startsWith('verify'))
                return (...given) => {
                    const expected = given.find((each) => each && typeof each === 'object' && !Array.isArray(each));
                    calls.push({ verb, expected, filter: given.find((each) => typeof each === 'string') ?? null });
                };
            return () => undefined; // closing and going to places change no answer here
        },
    });
}

async function run(test) {
    const calls = [];
    const opened = [];
    try {
        const script = stripTypeScriptTypes(`async function main(helper, _) {${test.script}\n}`);
        const context = vm.createContext({ console });
        await vm.runInContext(`(${script})`, context, { timeout: 5000 })(helperOf(test, calls, opened), {});
    } catch (error) {
        return { name: test.name, error: String(error) };
    }
    return { name: test.name, calls, opened };
}

async function main() {
    let input = '';
    for await (const chunk of process.stdin) input += chunk;
    const results = [];
    for (const test of JSON.parse(input)) results.push(await run(test));
    process.stdout.write(JSON.stringify(results));
}

main();
