import { FormSelect, FormSelectOption } from '@patternfly/react-core/dist/esm/components/FormSelect';
import { useMemo, useState } from 'react';
import { call, type CallOptions } from '../api/client';
import type { EntryKind, KnownList, Member } from '../api/types';
import { t } from '../texts';
import { useRoute } from '../shell/router';
import { ErrorAlert, Loading, PageHeader, usePoll } from '../ui';
import { choices } from './domains';
import { EntryList } from './EntryList';
import { NoMember } from './NoMember';
import { RefreshPanel } from './RefreshPanel';
import { useRefresh } from './useRefresh';
import './directory.css';

interface Known {
  member: Member | null;
  lists: KnownList[];
}

async function readKnown(options: CallOptions): Promise<Known> {
  const [domain, { domains }] = await Promise.all([
    call('domain.get', {}, options),
    call('directory.domains', {}, options),
  ]);
  return { member: domain.enable_domain ? domain : null, lists: domains };
}

const kTrusted = 0;

function Lists({
  kind,
  member,
  lists,
  onNew,
}: {
  kind: EntryKind;
  member: Member;
  lists: KnownList[];
  onNew: () => void;
}) {
  const trusted = member.manage_mode === kTrusted;
  const own = member.domain_name.toUpperCase();
  // What is trusted adds to the choice when it is known; nothing waits for it.
  const names = usePoll((options) => call('domain.names', {}, options), 'names', { enabled: trusted });
  const [version, setVersion] = useState(0);
  const refresh = useRefresh(true, () => {
    setVersion((before) => before + 1);
    onNew();
  });
  const domains = useMemo(() => choices(own, lists, names.data?.domain_list ?? []), [own, lists, names.data]);
  const route = useRoute();
  // "#/users?domain=LAB" opens the list of that domain.
  const [chosen, setChosen] = useState(() => route.query.get('domain')?.toUpperCase() ?? own);
  const domain = domains.includes(chosen) ? chosen : own;
  return (
    <>
      <div className="vorn-directory__domain">
        <label htmlFor="directory-domain">{t('directory.domain')}</label>
        <FormSelect id="directory-domain" value={domain} onChange={(_event, name) => setChosen(name)}>
          {domains.map((name) => (
            <FormSelectOption
              key={name}
              value={name}
              label={name === own ? t('directory.own', { domain: name }) : name}
            />
          ))}
        </FormSelect>
      </div>
      <RefreshPanel
        refresh={refresh}
        domain={domain}
        forbidden={trusted || domain === own ? null : t('refresh.forbidden')}
      />
      <EntryList key={domain} kind={kind} domain={domain} version={version} />
    </>
  );
}

export default function DirectoryPage({ kind }: { kind: EntryKind }) {
  const { data, error, loading, reload } = usePoll(readKnown, 'known', { keep: true });
  const users = kind === 'user';
  return (
    <div className="vorn-page">
      <PageHeader
        title={t(users ? 'directory.users' : 'directory.groups')}
        description={t(users ? 'directory.intro.users' : 'directory.intro.groups')}
      />
      {error !== undefined && <ErrorAlert error={error} title={t('directory.failed')} onRetry={reload} />}
      {loading && <Loading />}
      {data !== undefined && data.member === null && <NoMember body={t('directory.noMember')} />}
      {data !== undefined && data.member !== null && (
        <Lists
          key={data.member.domain_name}
          kind={kind}
          member={data.member}
          lists={data.lists}
          onNew={reload}
        />
      )}
    </div>
  );
}
