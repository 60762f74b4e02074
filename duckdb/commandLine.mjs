#!/usr/bin/env node
// The engine's program where only its package for Node.js is: takes what `tav table --format parquet` asks of `duckdb`.
//
//   TAV_DUCKDB=duckdb/commandLine.mjs tav table ...
//
// Statements are on standard input. The first that fails is told on standard error, and the exit status is 1.
import {readFileSync} from 'node:fs';
import {parseArgs} from 'node:util';

import {DuckDBInstance} from '@duckdb/node-api';

// The engine's program has long options with one dash.
const args = process.argv.slice(2).map((word) => word.replace(/^-(?=[a-z]{2})/, '--'));
const {values} = parseArgs({args, options: {unsigned: {type: 'boolean'}, batch: {type: 'boolean'}, bail: {type: 'boolean'}}});

try
{
  const instance = await DuckDBInstance.create(':memory:', values.unsigned ? {allow_unsigned_extensions: 'true'} : {});
  const connection = await instance.connect();
  await connection.run(readFileSync(0, 'utf8'));
}
catch (error)
{
  console.error(error.message);
  process.exitCode = 1;
}
