// Puts a .br and a .gz beside each file of dist/ and prints the sizes. Fails when the page outgrows its budget.
import { readFileSync, readdirSync, rmSync, writeFileSync } from 'node:fs';
import { join, relative } from 'node:path';
import { fileURLToPath } from 'node:url';
import { brotliCompressSync, constants, gzipSync } from 'node:zlib';

const kBudget = 400 * 1000;
const folder = fileURLToPath(new URL('../dist', import.meta.url));

function filesOf(path) {
  return readdirSync(path, { withFileTypes: true }).flatMap((entry) =>
    entry.isDirectory() ? filesOf(join(path, entry.name)) : [join(path, entry.name)],
  );
}

const rows = [];
for (const path of filesOf(folder)) {
  if (/\.(br|gz)$/.test(path)) {
    rmSync(path);
    continue;
  }
  const plain = readFileSync(path);
  const parameters = {
    [constants.BROTLI_PARAM_QUALITY]: 11,
    [constants.BROTLI_PARAM_SIZE_HINT]: plain.length,
  };
  const brotli = brotliCompressSync(plain, { params: parameters });
  const gzip = gzipSync(plain, { level: 9 });
  writeFileSync(`${path}.br`, brotli);
  writeFileSync(`${path}.gz`, gzip);
  rows.push({
    name: relative(folder, path),
    plain: plain.length,
    gzip: gzip.length,
    brotli: brotli.length,
  });
}

rows.sort((a, b) => b.brotli - a.brotli);
const sum = (key) => rows.reduce((total, row) => total + row[key], 0);
const line = (name, row) =>
  `${name.padEnd(48)} ${[row.plain, row.gzip, row.brotli].map((n) => (n / 1000).toFixed(1).padStart(9)).join('')}`;
console.log(`${'kB'.padEnd(48)} ${['plain', 'gzip', 'brotli'].map((n) => n.padStart(9)).join('')}`);
for (const row of rows) console.log(line(row.name, row));
const total = { plain: sum('plain'), gzip: sum('gzip'), brotli: sum('brotli') };
console.log(line('all', total));

if (total.brotli > kBudget) {
  console.error(`The page weighs ${total.brotli} bytes, compressed with brotli: ${kBudget} is the most.`);
  process.exit(1);
}
