import type { MethodName } from './types';

const kDomain = 'VORN.Core.Directory.Domain';
const kDirectory = 'VORN.Appliance.Directory';

interface Target {
  path: string;
  // How long an answer may take, in milliseconds.
  deadline: number;
}

const kUsual = 60_000;
// A join is given up by the appliance itself well before this.
const kJoin = 330_000;

function target(api: string, version: number, method: string, deadline = kUsual): Target {
  return { path: `/webapi/${api}/${version}/${method}`, deadline };
}

export const methods: Record<MethodName, Target> = {
  'domain.get': target(kDomain, 1, 'get'),
  'domain.set': target(kDomain, 1, 'set', kJoin),
  'domain.test_dc': target(kDomain, 1, 'test_dc'),
  'domain.names': target(kDomain, 1, 'get_domain_list'),
  'domain.list': target(kDomain, 2, 'get_domain_list'),
  'domain.update_start': target(kDomain, 1, 'update_start'),
  'domain.update_status': target(kDomain, 1, 'update_status'),
  'domain.update_stop': target(kDomain, 1, 'update_stop'),
  'conf.get': target(`${kDomain}.Conf`, 1, 'get'),
  'conf.set': target(`${kDomain}.Conf`, 1, 'set'),
  'schedule.get': target(`${kDomain}.Schedule`, 1, 'get'),
  'schedule.set': target(`${kDomain}.Schedule`, 1, 'set'),
  'directory.users': target(kDirectory, 1, 'users'),
  'directory.groups': target(kDirectory, 1, 'groups'),
  'directory.domains': target(kDirectory, 1, 'domains'),
  'directory.refresh_progress': target(kDirectory, 1, 'refresh_progress'),
  'directory.join_steps': target(kDirectory, 1, 'join_steps'),
  'directory.overview': target(kDirectory, 1, 'overview'),
  'directory.leave': target(kDirectory, 1, 'leave', kJoin),
  'events.list': target('VORN.Appliance.EventLog', 1, 'list'),
};
