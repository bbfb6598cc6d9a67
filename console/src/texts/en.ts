import { common } from './en/common';
import { directory } from './en/directory';
import { domains } from './en/domains';
import { events } from './en/events';
import { join } from './en/join';
import { leave } from './en/leave';
import { login } from './en/login';
import { options } from './en/options';
import { overview } from './en/overview';
import { schedule } from './en/schedule';

// All texts of the page in English.
export const en = {
  ...common,
  ...login,
  ...overview,
  ...join,
  ...leave,
  ...domains,
  ...directory,
  ...options,
  ...schedule,
  ...events,
} as const;
