export const domains = {
  'domains.title': 'Domains',
  'domains.intro': 'The domains whose users and groups this appliance can see.',
  'domains.loading': 'Loading the list of domains…',
  'domains.failed': 'The list of domains can’t be shown.',
  'domains.noMember': 'In a workgroup there are no domains to list.',
  'domains.name': 'Domain',
  'domains.dns': 'DNS name',
  'domains.own': 'Own domain',
  'domains.units': 'Organisational units of {domain}',
  'domains.units.scope':
    'Trusted domains are switched off: these are the organisational units of the own domain, {domain}.',
  'domains.units.none': 'No organisational units',
  'domains.units.none.body':
    'The domain has none, or they are not known yet. A refresh of the users asks for them.',
  'domains.unit': 'Organisational unit',
  'domains.place': 'Place in the directory',
  'domains.search': 'Search domains and DNS names',
  'domains.search.units': 'Search organisational units',
  'domains.shown': {
    one: '{first} to {last} of {count} domain',
    other: '{first} to {last} of {count} domains',
  },
  'domains.shown.units': {
    one: '{first} to {last} of {count} organisational unit',
    other: '{first} to {last} of {count} organisational units',
  },
  'domains.pages': 'Pages of the domains',
  'domains.pages.end': 'Pages of the domains, below the list',
} as const;
