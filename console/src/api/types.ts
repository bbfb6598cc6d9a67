// What the methods of the web API take and answer. Times are in seconds since 1970.

export interface AdvancedOptions {
  enable_advance_option: boolean;
  kdc: string;
  netbios_name: string;
  fqdn_name: string;
  register_nics: string[];
}

export type DomainState =
  | { enable_domain: false }
  | {
      enable_domain: true;
      domain_name: string;
      domain_type: 'AD' | 'NT4';
      // 0: trusted domains are used; 1: they are not.
      manage_mode: number;
      // Joined with commas.
      dns: string;
      advance_domain_conf: AdvancedOptions;
    };

export type Member = Extract<DomainState, { enable_domain: true }>;

export interface JoinParameters {
  enable_domain: true;
  domain_name: string;
  username: string;
  password: string;
  dns?: string;
  manage_mode?: number;
  advance_domain_conf?: { enable_advance_option: boolean } & Partial<
    Omit<AdvancedOptions, 'enable_advance_option'>
  >;
}

export interface DomainOptions {
  enable_sync_time: boolean;
  enable_server_signing: boolean;
  enable_rpc_enum_usergroup: boolean;
  domain_nested_group: number;
  disable_domain_admins: boolean;
}

export interface StoredSchedule {
  date: string;
  date_type: 0 | 1;
  hour: number;
  last_work_hour: number;
  min: number;
  repeat: number;
  repeat_hour: number;
  week_name: string;
}

export type Schedule = { date_type: 2 } | StoredSchedule;

export interface ScheduleParameters {
  date_type: 0 | 1 | 2;
  hour?: number;
  min?: number;
  week_name?: string;
  date?: string;
  repeat?: number;
  repeat_hour?: number;
  last_work_hour?: number;
}

export type EntryKind = 'user' | 'group';

export interface ListParameters {
  domain?: string;
  offset?: number;
  limit?: number;
  search?: string;
}

export interface DirectoryEntry {
  name: string;
  id: number | null;
  display: string;
}

export interface DirectoryList {
  total: number;
  offset: number;
  domain: string;
  fetched: number | null;
  entries: DirectoryEntry[];
}

export interface KnownList {
  domain: string;
  kind: EntryKind;
  count: number;
  fetched: number;
}

export interface RefreshError {
  domain: string;
  kind: string;
  reason: string;
}

export interface RefreshProgress {
  running: boolean;
  kind: EntryKind;
  domain: string;
  count: number;
  domains_done: number;
  domains: number;
  started: number;
  updated: number;
  errors: RefreshError[];
}

export type StepOutcome = 'ok' | 'failed' | 'running' | 'skipped';

export interface JoinStep {
  name: string;
  server: string;
  outcome: StepOutcome;
  detail: string;
  milliseconds: number;
}

export interface JoinSteps {
  id: string;
  action: 'join' | 'leave';
  domain: string;
  started: number;
  finished: number | null;
  success: boolean | null;
  message: string;
  steps: JoinStep[];
  leftovers: string[];
}

export interface NetworkInterface {
  name: string;
  addresses: string[];
}

export interface Overview {
  host_name: string;
  computer_account: string | null;
  last_test: { time: number; success: boolean; milliseconds: number } | null;
  interfaces: NetworkInterface[];
  refresh: {
    running: boolean;
    domains_done: number;
    domains: number;
    count: number;
    started: number;
    finished: number | null;
    errors: RefreshError[];
  } | null;
  busy: 'join' | 'leave' | null;
  clock: { time: number; utc_offset: number };
}

export interface LeaveParameters {
  delete_account: boolean;
  username?: string;
  password?: string;
}

export interface LogEvent {
  time: number;
  kind: number;
  level: number;
  code: number;
  text: string;
}

export interface EventList {
  total: number;
  events: LogEvent[];
}

// Name of a row of a domain list: name, value, DNS name (version 2 of get_domain_list).
export type DomainRow = [string, string, string];

type None = Record<string, never>;

// All methods, by the name that call() takes: parameters and answer.
export interface Methods {
  'domain.get': { parameters: None; data: DomainState };
  'domain.set': { parameters: JoinParameters | { enable_domain: false }; data: null };
  'domain.test_dc': { parameters: None; data: { test_join_success: boolean } };
  'domain.names': { parameters: None; data: { domain_list: string[] } };
  'domain.list': { parameters: None; data: { domain_list: DomainRow[] } };
  'domain.update_start': { parameters: { domain_name?: string }; data: { task_id: string } };
  'domain.update_status': { parameters: { task_id: string }; data: { status: 'updating' | 'finish' } };
  'domain.update_stop': { parameters: None; data: null };
  'conf.get': { parameters: None; data: DomainOptions };
  'conf.set': { parameters: Partial<DomainOptions>; data: null };
  'schedule.get': { parameters: None; data: Schedule };
  'schedule.set': { parameters: ScheduleParameters; data: null };
  'directory.users': { parameters: ListParameters; data: DirectoryList };
  'directory.groups': { parameters: ListParameters; data: DirectoryList };
  'directory.domains': { parameters: None; data: { domains: KnownList[] } };
  'directory.refresh_progress': { parameters: None; data: RefreshProgress | null };
  'directory.join_steps': { parameters: None; data: JoinSteps | null };
  'directory.overview': { parameters: None; data: Overview };
  'directory.leave': { parameters: LeaveParameters; data: null };
  'events.list': { parameters: { offset?: number; limit?: number }; data: EventList };
}

export type MethodName = keyof Methods;

export interface SessionInfo {
  csrf: string;
  user: string;
  idle_seconds: number;
  expires: number;
}
